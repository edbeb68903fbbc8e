#pragma once

#include "ironmoat/http_headers.h"
#include "records/web_tunnel.h"

namespace ironmoat {

/// The header block conversion, shared by the two records that carry one: absent stays absent, and
/// a present block goes through its initialiser, also when all its fields are absent. Moves out of
/// the block.
Optional<DrelUserPayloadHttpHeaders> convertHeaderBlock(
    Optional<VeskCorvelProtocolHttpHeaders>& block);

}  // namespace ironmoat
