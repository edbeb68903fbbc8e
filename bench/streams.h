#pragma once

#include <cstddef>
#include <string_view>
#include <vector>

#include "ironmoat/values.h"
#include "plist/encoder.h"
#include "records/message_payload.h"

namespace ironmoat::bench {

/// Different messages to unpack one after the other. They show the cost of mispredicted branches,
/// which one repeated message hides.
struct Stream {
  std::string_view name;
  std::vector<VeskCorvelProtocolPayload> records;
  bool anyOrder = false;        ///< the keys have another order in each message
  std::size_t unknownKeys = 0;  ///< added to each message
  bool compact = false;         ///< without white space in XML
};

/// Streams of `count` messages with about 16 fields, by default those of a typical payload:
///
///     lengths  heavy-tailed lengths of texts and data, integers of any size
///     kinds    one of ten sets of fields
///     some     each field of the table with a probability of its own
///     order    keys in any order
///     varied   lengths, some and order at once
///
/// and of one message:
///
///     deep     200 nested payloads; its XML is compact, because indentation would dominate it
///     unknown  3,300 unknown keys
///
/// The result depends only on `count`.
std::vector<Stream> streams(std::size_t count);

std::vector<Data> messagesOf(const Stream& stream, plist::Format form);

}  // namespace ironmoat::bench
