#pragma once

#include <utility>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"
#include "plist/property_list_decoder.h"
#include "values/unknown_keys.h"

namespace ironmoat {

/// The first half of every unpacker: a fresh decoder fills the wire record from the bytes, and is
/// gone before anything is converted. A rejection, a value up to here, is thrown.
template <class Wire>
void decodeMessage(const Data& message, Wire& record, UnknownKeysArguments* unknownKeys = nullptr) {
  const plist::PropertyListDecoder decoder;
  if (auto rejection = decoder.decode(message, record, unknownKeys)) throw std::move(*rejection);
}

/// The unknown keys of a message that decodes as a `Wire`; throws its rejection if it does not.
template <class Wire>
UnknownKeys unknownKeysIn(const Data& message) {
  return UnknownKeys([&] {
    Wire record;
    UnknownKeysArguments found;
    decodeMessage(message, record, &found);
    return found;
  });
}

}  // namespace ironmoat
