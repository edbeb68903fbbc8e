// Target: decoding as each type of message. The outcome and the costs must be those of a second,
// slow decoder. The record must be equal after a round trip through a reply. Record and tree,
// written in either format, must give the same outcome. (S1, S2, S4, S9-S11)

#include <cstddef>
#include <cstdint>
#include <functional>
#include <stdexcept>
#include <string>

#include "document_oracles.h"
#include "frames/record_codec.h"
#include "plist/encoder.h"
#include "plist/property_list_decoder.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/web_tunnel.h"
#include "slow_decode.h"
#include "support/tight_message.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"

namespace {

using namespace ironmoat;
using fuzz::Outcome;
using fuzz::require;

/// Limits so small that a message of a few bytes can exceed them.
constexpr plist::Budget kSmallBudget{
    .recordBytes = 100'000, .deliveredBytes = 20'000, .scannedEntries = 2'000};

Outcome rejected(const DecodingError& error) {
  return {false, std::string(nameOf(error.kind())) + " " + error.path() + ": " + error.what()};
}

/// The body of the reply, or the rejection as text.
template <class Unpacker>
Outcome unpack(const Data& message) {
  try {
    BlockBuilder out;
    frames::encodeRecord(Unpacker().unpack(message), out);
    const BlockRef block = out.finish();
    return {true, {block->bytes(), block->size()}};
  } catch (const DecodingError& rejection) {
    require(rejection.offset().value_or(0) <= message.size());
    return rejected(rejection);
  }
}

/// The slow decoder's record as text, or its rejection; sets `left` to the rest of the budget.
template <class Wire>
Outcome decode(const plist::Document& document, plist::Budget& left) {
  UnknownKeysArguments unknown;
  plist::Decoding decoding{.document = document, .budget = left, .unknownKeys = &unknown};
  Wire record;
  const bool accepted = record.decode(plist::Decoder(decoding));
  left = decoding.budget;
  require(accepted != decoding.rejection.has_value());
  if (!accepted) return rejected(*decoding.rejection);
  Outcome outcome{true, {}};
  fuzz::describe(outcome.text, record);
  return outcome;
}

template <class Unpacker, class Wire>
void unpackAs(const Data& message, const plist::Document& document) {
  using Output = typename Unpacker::MessageSchemaType;
  plist::Budget left = kSmallBudget;
  fuzz::SlowDecoder slow(document, kSmallBudget);
  const Outcome decoded = decode<Wire>(document, left);
  require(slow.decode<Wire>() == decoded);
  require(left.recordBytes == slow.left().recordBytes &&
          left.deliveredBytes == slow.left().deliveredBytes &&
          left.scannedEntries == slow.left().scannedEntries);
  require(left.recordBytes <= kSmallBudget.recordBytes &&
          left.deliveredBytes <= kSmallBudget.deliveredBytes &&
          left.scannedEntries <= kSmallBudget.scannedEntries);
  // The message exceeds the small budget. The full one takes much time, so few messages get it.
  const bool costly = decoded.text.starts_with("limitExceeded");
  if (costly && std::hash<std::string_view>()(message.view()) % 64 != 0) return;

  const Outcome first = unpack<Unpacker>(message);
  require(costly ||
          (first.accepted == decoded.accepted && (first.accepted || first.text == decoded.text)));
  if (first.accepted) {
    const auto record = frames::decodeRecord<Output>(Data(std::string_view(first.text)));
    BlockBuilder carried;
    frames::encodeRecord(record, carried);
    require(std::string_view(carried.bytes(), carried.size()) == first.text);
  }
  const fuzz::Walk walked = fuzz::walk(document);
  if (walked.tooLarge()) return;  // writing out many shared values would slow fuzzing down

  const auto check = [&](auto write, plist::Format form) {
    try {
      require(unpack<Unpacker>(write(form)) == first);
    } catch (const std::invalid_argument&) {
      require(form == plist::Format::xml);  // text that XML cannot hold
    }
  };
  for (const plist::Format form : {plist::Format::binary, plist::Format::xml}) {
    if (walked.writable) {
      check(
          [&](plist::Format as) {
            return as == plist::Format::xml ? writeXml(document) : writeBinary(document);
          },
          form);
    }
    if (first.accepted) {
      Wire wire;
      require(!plist::PropertyListDecoder().decode(message, wire));
      check([&](plist::Format as) { return plist::PropertyListEncoder(as).encode(wire); }, form);
    }
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const Data message = testing::tightMessage({reinterpret_cast<const char*>(data), size});
  plist::Document document;
  const std::string malformed = fuzz::rejectionOf(plist::read, message, document);
  if (!malformed.empty()) {
    const Outcome outcome = unpack<VeskCommandResponseUnpacker>(message);
    require(!outcome.accepted && outcome == unpack<VeskCorvelPayloadUnpacker>(message));
    return 0;
  }
  unpackAs<VeskCorvelPayloadUnpacker, VeskCorvelProtocolPayload>(message, document);
  unpackAs<VeskCommandResponseUnpacker, VeskCommandResponseSchema>(message, document);
  unpackAs<VeskCommandWebTunnelResponseUnpacker, VeskCommandWebTunnelResponseSchema>(message,
                                                                                     document);
  return 0;
}
