#pragma once

#include "host/message_unpacker.h"
#include "ironmoat/command_response.h"
#include "values/unknown_keys.h"

namespace ironmoat {

struct VeskCommandResponseUnpacker {
  using MessageSchemaType = VeskCommandResponse;
  /// Throws a DecodingError, or what an output record's initialiser throws.
  [[nodiscard]] VeskCommandResponse unpack(const Data& message) const;
  [[nodiscard]] UnknownKeys unknownKeys(const Data& message) const;
};
static_assert(MessageUnpacker<VeskCommandResponseUnpacker>);

}  // namespace ironmoat
