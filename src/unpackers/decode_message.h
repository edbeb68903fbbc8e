#pragma once

#include "ironmoat/values.h"
#include "plist/property_list_decoder.h"

namespace ironmoat {

/// The first half of every unpacker: a fresh decoder, the wire record out of the bytes, and the
/// decoder gone again before anything is converted.
template <class Wire>
Wire decodeMessage(const Data& message) {
  const plist::PropertyListDecoder decoder;
  return decoder.decode<Wire>(message);
}

}  // namespace ironmoat
