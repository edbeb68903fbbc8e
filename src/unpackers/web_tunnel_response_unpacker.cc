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

Unpacked<VeskCommandWebTunnelResponse> VeskCommandWebTunnelResponseUnpacker::unpack(
    const Data& message) const {
  VeskCommandWebTunnelResponseSchema wire;
  if (auto refusal = decodeMessage(message, wire)) return std::move(*refusal);
  Converted converted{.httpHeaders = convertHeaderBlock(wire.httpHeaders)};
  return Unpacked<VeskCommandWebTunnelResponse>([&] {
    return argumentsFrom<VeskCommandWebTunnelResponse>(std::move(wire), std::move(converted));
  });
}

}  // namespace ironmoat
