#pragma once

#include <optional>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"
#include "plist/property_list_decoder.h"

namespace ironmoat {

/// The first half of every unpacker: a fresh decoder, the wire record out of the bytes, and the
/// decoder gone again before anything is converted. Returns why the message is refused, or none.
template <class Wire>
[[nodiscard]] std::optional<DecodingError> decodeMessage(const Data& message, Wire& record) {
  const plist::PropertyListDecoder decoder;
  return decoder.decode(message, record);
}

}  // namespace ironmoat
