#pragma once

#include <concepts>

#include "ironmoat/message_schema.h"
#include "ironmoat/values.h"

namespace ironmoat {

/// Turns the bytes of one message into one output record. `unpack` throws a DecodingError when the
/// bytes are not a valid message, and what the record's initialiser throws, unchanged. Called on
/// threads of the host's choosing, many at once; a call must not depend on another.
template <class U>
concept MessageUnpacker = MessageSchema<typename U::MessageSchemaType> &&
    requires(const U& unpacker, const Data& message) {
  { unpacker.unpack(message) } -> std::same_as<typename U::MessageSchemaType>;
};

}  // namespace ironmoat
