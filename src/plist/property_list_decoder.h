#pragma once

#include <optional>
#include <utility>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"
#include "plist/decoder.h"
#include "plist/document.h"
#include "plist/reader.h"

namespace ironmoat::plist {

/// Decodes a property list of either format into a record. Stateless.
class PropertyListDecoder {
 public:
  /// Fills `record`, which must be newly made, by its `decode`. Returns the rejection if there is
  /// one; the record must then not be used. A decoded record holds a reference to the message's
  /// block. `unknownKeys` collects the unknown keys unless it is null.
  template <class R>
  [[nodiscard]] std::optional<DecodingError> decode(
      const Data& message, R& record, UnknownKeysArguments* unknownKeys = nullptr) const {
    Document document;
    std::optional<DecodingError> rejection = read(message, document);
    if (rejection) return rejection;
    Decoding decoding{.document = document, .message = &message, .unknownKeys = unknownKeys};
    if (!record.decode(Decoder(decoding))) rejection = std::move(decoding.rejection);
    return rejection;
  }
};

}  // namespace ironmoat::plist
