// Any bytes as a message of each kind, all the way: unpacked, carried in a reply, taken out of it;
// written again in both forms and unpacked to the same reply. The same bytes give the same error.

#include <cstdint>
#include <cstdlib>
#include <stdexcept>
#include <string>

#include "frames/record_codec.h"
#include "plist/encoder.h"
#include "plist/property_list_decoder.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/web_tunnel.h"
#include "support/tight_message.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"

namespace {

using namespace ironmoat;

void require(bool holds) {
  if (!holds) std::abort();
}

/// The reply's body, or the refusal in words.
template <class Unpacker>
std::string outcome(const Data& message, bool& accepted) {
  accepted = false;
  try {
    BlockBuilder out;
    frames::encodeRecord(Unpacker().unpack(message), out);
    const BlockRef block = out.finish();
    accepted = true;
    return {block->bytes(), block->size()};
  } catch (const DecodingError& error) {
    const std::uint64_t offset = error.offset().value_or(0);
    require(offset <= message.size());
    return std::string(nameOf(error.kind())) + " " + error.path() + " " + error.what() + " " +
           std::to_string(offset);
  }
}

template <class Unpacker, class Wire>
void unpackAs(const Data& message) {
  using Output = typename Unpacker::MessageSchemaType;
  bool accepted = false;
  bool acceptedAgain = false;
  const std::string first = outcome<Unpacker>(message, accepted);
  require(outcome<Unpacker>(message, acceptedAgain) == first && accepted == acceptedAgain);
  if (!accepted) return;

  BlockBuilder carried;
  const auto decoded = frames::decodeRecord<Output>(Data(std::string_view(first)));
  frames::encodeRecord(decoded, carried);
  const BlockRef block = carried.finish();
  require(std::string_view(block->bytes(), block->size()) == first);

  if (first.size() > 100000) return;  // shared values written out take the fun out of fuzzing
  const Wire wire = plist::PropertyListDecoder().decode<Wire>(message);
  for (const plist::Form form : {plist::Form::binary, plist::Form::xml}) {
    try {
      const Data written = plist::PropertyListEncoder(form).encode(wire);
      require(outcome<Unpacker>(written, accepted) == first && accepted);
    } catch (const std::invalid_argument&) {
      require(form == plist::Form::xml);  // text that XML cannot hold
    }
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const Data message = testing::tightMessage({reinterpret_cast<const char*>(data), size});
  unpackAs<VeskCorvelPayloadUnpacker, VeskCorvelProtocolPayload>(message);
  unpackAs<VeskCommandResponseUnpacker, VeskCommandResponseSchema>(message);
  unpackAs<VeskCommandWebTunnelResponseUnpacker, VeskCommandWebTunnelResponseSchema>(message);
  return 0;
}
