#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "ironmoat/values.h"
#include "plist/encoder.h"
#include "records/message_payload.h"

namespace ironmoat::bench {

/// The messages of all measurements.
struct Sample {
  std::string_view name;
  VeskCorvelProtocolPayload record;
};

/// min: "c" alone. typical: 16 fields of a push message, about 500 bytes. full: every field, lists
/// filled. fanout: 500 typical payloads in a typical one. blob: typical with 1 MiB of payload.
/// unicode: typical with no Latin letter in its texts.
const std::vector<Sample>& samples();
const Sample& sample(std::string_view name);

/// Payloads of different `number` have no text, data or large integer in common.
VeskCorvelProtocolPayload typicalPayload(unsigned number);

/// Bytes as in a token, and hexadecimal digits; both depend only on the number.
std::string noise(std::size_t size, std::uint64_t number);
std::string hex(std::size_t digits, std::uint64_t number);

/// The bytes as a message in a block that only one thread uses, as in the host.
Data inOneThreadBlock(std::string_view bytes);

/// Rewrites XML of the library's writer as other writers put it: with a DOCTYPE, and data in lines
/// of 76 columns.
std::string asOrdinaryWriters(std::string_view xml);

/// The record as a message.
template <class R>
Data messageOf(const R& record, plist::Format form) {
  const Data message = plist::PropertyListEncoder(form).encode(record);
  if (form == plist::Format::binary) return inOneThreadBlock(message.view());
  return inOneThreadBlock(asOrdinaryWriters(message.view()));
}

/// A record with a last field of the wrong kind. A reader finds the error only after it has read
/// the document and decoded the other fields.
struct WrongAtLast {
  const VeskCorvelProtocolPayload& record;
  void encode(plist::Encoder& encoder) const {
    record.encode(encoder);
    encoder.builder().string(
        VeskCorvelProtocolPayload::CodingKeys::of<&VeskCorvelProtocolPayload::allowGDR>()
            .stringValue());
    encoder.builder().string("wrong");
  }
};

/// The message with its last object out of bounds or its last end tag misspelt. A reader finds the
/// error only after everything else.
Data brokenAtLast(const Data& message, plist::Format form);

constexpr std::string_view nameOf(plist::Format form) {
  return form == plist::Format::binary ? "binary" : "xml";
}

}  // namespace ironmoat::bench
