#pragma once

#include "ironmoat/values.h"
#include "plist/decoder.h"
#include "plist/document.h"
#include "plist/reader.h"

namespace ironmoat::plist {

/// Bytes of either form to a record `R`, by `R::decode(const Decoder&)`. Holds nothing between
/// calls.
class PropertyListDecoder {
 public:
  /// Throws DecodingError, and whatever R's decoding throws, unchanged. The record keeps a
  /// reference to the message's block, and depends on nothing else.
  template <class R>
  [[nodiscard]] R decode(const Data& message) const {
    Document document;
    read(message, document);
    Budget budget{.message = &message};
    const Decoder decoder(document, budget);
    return R::decode(decoder);
  }
};

}  // namespace ironmoat::plist
