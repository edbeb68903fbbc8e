#include "unpackers/command_response_unpacker.h"

#include <utility>

#include "records/command_response.h"
#include "unpackers/conversion.h"
#include "unpackers/decode_message.h"

namespace ironmoat {

Unpacked<VeskCommandResponse> VeskCommandResponseUnpacker::unpack(const Data& message) const {
  VeskCommandResponseSchema wire;
  if (auto refusal = decodeMessage(message, wire)) return std::move(*refusal);
  return Unpacked<VeskCommandResponse>(
      [&] { return argumentsFrom<VeskCommandResponse>(std::move(wire)); });
}

}  // namespace ironmoat
