#include "unpackers/web_tunnel_response_unpacker.h"

#include "records/web_tunnel.h"
#include "unpackers/conversion.h"
#include "unpackers/decode_message.h"
#include "unpackers/header_block.h"

namespace ironmoat {

namespace {

struct Converted {
  Optional<DrelUserPayloadHttpHeaders> httpHeaders;

  using Fields = FieldList<Converted, &Converted::httpHeaders>;
};

}  // namespace

VeskCommandWebTunnelResponse VeskCommandWebTunnelResponseUnpacker::unpack(
    const Data& message) const {
  VeskCommandWebTunnelResponseSchema wire;
  decodeMessage(message, wire);
  Converted converted{.httpHeaders = convertHeaderBlock(wire.httpHeaders)};
  return VeskCommandWebTunnelResponse([&] {
    return argumentsFrom<VeskCommandWebTunnelResponse>(std::move(wire), std::move(converted));
  });
}

UnknownKeys VeskCommandWebTunnelResponseUnpacker::unknownKeys(const Data& message) const {
  return unknownKeysIn<VeskCommandWebTunnelResponseSchema>(message);
}

}  // namespace ironmoat
