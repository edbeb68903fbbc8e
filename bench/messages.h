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

/// The messages that everything is measured with.
struct Sample {
  std::string_view name;
  VeskCorvelProtocolPayload record;
};

/// min: "c" alone. typical: 16 fields of a push message, about 500 bytes. full: every field, lists
/// filled. fanout: 500 typical payloads in a typical one. blob: typical with 1 MiB of payload.
/// unicode: typical with no Latin letter in its texts.
const std::vector<Sample>& samples();
const Sample& sample(std::string_view name);

/// No two payloads of different `number` share a text, data or large integer.
VeskCorvelProtocolPayload typicalPayload(unsigned number);

/// Bytes that look like a token's, and hexadecimal digits: the same for the same number, always.
std::string noise(std::size_t size, std::uint64_t number);
std::string hex(std::size_t digits, std::uint64_t number);

/// The bytes as a message that one thread has to itself, which is how the host makes them.
Data inOneThreadBlock(std::string_view bytes);

/// A message of our own writer as others put it: with a DOCTYPE, and data in lines of 76 columns.
std::string asOrdinaryWriters(std::string_view xml);

/// The record as a message, ready to be unpacked.
template <class R>
Data messageOf(const R& record, plist::Format form) {
  const Data message = plist::PropertyListEncoder(form).encode(record);
  if (form == plist::Format::binary) return inOneThreadBlock(message.view());
  return inOneThreadBlock(asOrdinaryWriters(message.view()));
}

/// The record with a last field of the wrong kind: the document is read by then, and the other
/// fields are decoded.
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

/// The message with its last object out of bounds or its last end tag misspelt: all else is read by
/// then.
Data brokenAtLast(const Data& message, plist::Format form);

constexpr std::string_view nameOf(plist::Format form) {
  return form == plist::Format::binary ? "binary" : "xml";
}

}  // namespace ironmoat::bench
