#pragma once

#include "host/message_unpacker.h"
#include "ironmoat/user_payload.h"
#include "values/unknown_keys.h"

namespace ironmoat {

struct VeskCorvelPayloadUnpacker {
  using MessageSchemaType = DrelUserPayload;
  /// Throws a DecodingError, or what an output record's initialiser throws.
  [[nodiscard]] DrelUserPayload unpack(const Data& message) const;
  [[nodiscard]] UnknownKeys unknownKeys(const Data& message) const;
};
static_assert(MessageUnpacker<VeskCorvelPayloadUnpacker>);

}  // namespace ironmoat
