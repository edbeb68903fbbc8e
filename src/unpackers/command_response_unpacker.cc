#include "unpackers/command_response_unpacker.h"

#include "records/command_response.h"
#include "unpackers/conversion.h"
#include "unpackers/decode_message.h"

namespace ironmoat {

VeskCommandResponse VeskCommandResponseUnpacker::unpack(const Data& message) const {
  const auto wire = decodeMessage<VeskCommandResponseSchema>(message);
  return VeskCommandResponse::with(argumentsFrom<VeskCommandResponse>(wire));
}

}  // namespace ironmoat
