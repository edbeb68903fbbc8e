#pragma once

#include <utility>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"
#include "plist/property_list_decoder.h"

namespace ironmoat {

/// The first half of every unpacker: a fresh decoder fills the wire record from the bytes, and is
/// gone before anything is converted. A rejection, a value up to here, is thrown.
template <class Wire>
void decodeMessage(const Data& message, Wire& record) {
  const plist::PropertyListDecoder decoder;
  if (auto rejection = decoder.decode(message, record)) throw std::move(*rejection);
}

}  // namespace ironmoat
