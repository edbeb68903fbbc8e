// Target: decoding the record of a reply. The first byte chooses the record's type, the rest is the
// encoded record. A decoded record must be encoded as the same bytes. (S14)

#include <cstdint>
#include <cstdlib>
#include <optional>
#include <string_view>

#include "frames/record_codec.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "support/tight_message.h"

namespace {

using namespace ironmoat;

template <MessageSchema R>
void recode(const Data& body) {
  std::optional<R> record;
  try {
    record.emplace(frames::decodeRecord<R>(body));
  } catch (const frames::RecordError&) {
    return;
  }
  BlockBuilder out;
  frames::encodeRecord(*record, out);
  if (std::string_view(out.bytes(), out.size()) != body.view()) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  const Data body = testing::tightMessage({reinterpret_cast<const char*>(data) + 1, size - 1});
  switch (data[0] % 3) {
    case 0:
      recode<VeskCommandResponse>(body);
      break;
    case 1:
      recode<VeskCommandWebTunnelResponse>(body);
      break;
    default:
      recode<DrelUserPayload>(body);
  }
  return 0;
}
