#pragma once

#include "host/message_unpacker.h"
#include "ironmoat/command_response.h"

namespace ironmoat {

struct VeskCommandResponseUnpacker {
  using MessageSchemaType = VeskCommandResponse;
  /// Throws what an output record's initialiser refuses with, unchanged.
  [[nodiscard]] Unpacked<VeskCommandResponse> unpack(const Data& message) const;
};
static_assert(MessageUnpacker<VeskCommandResponseUnpacker>);

}  // namespace ironmoat
