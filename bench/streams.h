#pragma once

#include <cstddef>
#include <string_view>
#include <vector>

#include "ironmoat/values.h"
#include "plist/encoder.h"
#include "records/message_payload.h"

namespace ironmoat::bench {

/// Messages that come one after the other, no two alike: what one message that is repeated does not
/// show, because a processor learns it by heart.
struct Stream {
  std::string_view name;
  std::vector<VeskCorvelProtocolPayload> records;
  bool anyOrder = false;        ///< of the keys, another one in each message
  std::size_t unknownKeys = 0;  ///< besides, in each
  bool compact = false;         ///< no white space in XML
};

/// Of about 16 fields, those of a typical payload unless it says otherwise. lengths: heavy-tailed
/// lengths of texts and data, integers of any size. kinds: ten choices of fields, mixed. some: each
/// field of the table by its own frequency. order: keys in any order. varied: lengths, some and
/// order at once.
///
/// And of one message each: deep: 200 payloads inside one another; its XML is compact, for its
/// indentation would be 60 times as much. unknown: 90 KB of unknown keys.
///
/// The same ones for the same `count`, always.
std::vector<Stream> streams(std::size_t count);

std::vector<Data> messagesOf(const Stream& stream, plist::Format form);

}  // namespace ironmoat::bench
