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
  const auto wire = decodeMessage<VeskCommandWebTunnelResponseSchema>(message);
  Converted converted{.httpHeaders = convertHeaderBlock(wire.httpHeaders)};
  return VeskCommandWebTunnelResponse::with(
      argumentsFrom<VeskCommandWebTunnelResponse>(wire, std::move(converted)));
}

}  // namespace ironmoat
