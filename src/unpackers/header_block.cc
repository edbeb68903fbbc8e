#include "unpackers/header_block.h"

#include "unpackers/conversion.h"

namespace ironmoat {

Optional<DrelUserPayloadHttpHeaders> convertHeaderBlock(
    Optional<VeskCorvelProtocolHttpHeaders>& block) {
  if (!block) return {};
  return DrelUserPayloadHttpHeaders::with(
      argumentsFrom<DrelUserPayloadHttpHeaders>(std::move(*block)));
}

}  // namespace ironmoat
