#include "frames/record_codec.h"

#include <utility>

#include "frames/record_reader.h"
#include "frames/record_writer.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "values/unknown_keys.h"

namespace ironmoat::frames {

template <MessageSchema R>
void encodeRecord(const R& record, BlockBuilder& out) {
  Writer(out).write(record);
}

template <MessageSchema R>
R decodeRecord(const Data& body, std::size_t* memory) {
  return R([&] {
    Reader reader(body);
    typename R::Arguments arguments{};
    reader.record<R>(arguments);
    reader.finish();
    if (memory != nullptr) *memory = body.size() + reader.recordBytes();
    return arguments;
  });
}

#define IRONMOAT_CODEC_OF(R)                              \
  template void encodeRecord<R>(const R&, BlockBuilder&); \
  template R decodeRecord<R>(const Data&, std::size_t*)

IRONMOAT_CODEC_OF(VeskCommandResponse);
IRONMOAT_CODEC_OF(VeskCommandWebTunnelResponse);
IRONMOAT_CODEC_OF(DrelUserPayload);
IRONMOAT_CODEC_OF(UnknownKeys);

}  // namespace ironmoat::frames
