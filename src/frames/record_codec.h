#pragma once

#include <stdexcept>

#include "ironmoat/message_schema.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::frames {

/// Bytes or a record break the rules that doc/frames.md gives for a record of that type.
class RecordError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Appends the body of a reply that carries `record`. Throws RecordError when it is nested too
/// deeply or too large for a reply; a part of it may then be in `out`.
template <MessageSchema R>
void encodeRecord(const R& record, BlockBuilder& out);

/// The record back. Trusts nothing: every length, count, tag and text is checked, lists and depth
/// are bounded as in ironmoat/limits.h. Text and bytes are slices of `body`. Throws RecordError,
/// and what the record's initialiser throws.
template <MessageSchema R>
R decodeRecord(const Data& body);

}  // namespace ironmoat::frames
