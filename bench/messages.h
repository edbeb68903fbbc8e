#pragma once

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

/// The bytes as a message that one thread has to itself, which is how the host makes them.
Data inOneThreadBlock(std::string_view bytes);

/// The record as a message, ready to be unpacked.
template <class R>
Data messageOf(const R& record, plist::Form form) {
  return inOneThreadBlock(plist::PropertyListEncoder(form).encode(record).view());
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
Data brokenAtLast(const Data& message, plist::Form form);

constexpr std::string_view nameOf(plist::Form form) {
  return form == plist::Form::binary ? "binary" : "xml";
}

}  // namespace ironmoat::bench
