#pragma once

#include "host/message_unpacker.h"
#include "ironmoat/web_tunnel_response.h"
#include "values/unknown_keys.h"

namespace ironmoat {

struct VeskCommandWebTunnelResponseUnpacker {
  using MessageSchemaType = VeskCommandWebTunnelResponse;
  /// Throws a DecodingError, or what an output record's initialiser throws.
  [[nodiscard]] VeskCommandWebTunnelResponse unpack(const Data& message) const;
  [[nodiscard]] UnknownKeys unknownKeys(const Data& message) const;
};
static_assert(MessageUnpacker<VeskCommandWebTunnelResponseUnpacker>);

}  // namespace ironmoat
