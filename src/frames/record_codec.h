#pragma once

#include <cstddef>
#include <stdexcept>

#include "ironmoat/message_schema.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::frames {

/// Bytes or a record violate what doc/protocol.md specifies for records of the type.
class RecordError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Appends `record` as the body of a reply. Throws RecordError if it exceeds the limits on nesting
/// or replies; then `out` may end with a part of it.
template <MessageSchema R>
void encodeRecord(const R& record, BlockBuilder& out);

/// The record that `body` encodes. Untrusted input: checks every length, count, bit and text, and
/// holds lists, text and nesting to ironmoat/limits.h. Text and data are slices of `body`. Throws
/// RecordError, and what the record's initialiser throws. `memory` becomes the bytes that the
/// record keeps besides itself: `body`, lists and values.
template <MessageSchema R>
R decodeRecord(const Data& body, std::size_t* memory = nullptr);

}  // namespace ironmoat::frames
