#include "unpackers/command_response_unpacker.h"

#include <utility>

#include "records/command_response.h"
#include "unpackers/conversion.h"
#include "unpackers/decode_message.h"

namespace ironmoat {

VeskCommandResponse VeskCommandResponseUnpacker::unpack(const Data& message) const {
  VeskCommandResponseSchema wire;
  decodeMessage(message, wire);
  return VeskCommandResponse([&] { return argumentsFrom<VeskCommandResponse>(std::move(wire)); });
}

UnknownKeys VeskCommandResponseUnpacker::unknownKeys(const Data& message) const {
  return unknownKeysIn<VeskCommandResponseSchema>(message);
}

}  // namespace ironmoat
