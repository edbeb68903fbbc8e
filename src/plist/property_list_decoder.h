#pragma once

#include <optional>
#include <utility>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"
#include "plist/decoder.h"
#include "plist/document.h"
#include "plist/reader.h"

namespace ironmoat::plist {

/// Bytes of either form to a record. Holds nothing between calls.
class PropertyListDecoder {
 public:
  /// Into `record`, freshly made, by its `decode`. Returns why the message is rejected; the record
  /// is then useless. None: the record keeps a reference to the message's block, and depends on
  /// nothing else.
  template <class R>
  [[nodiscard]] std::optional<DecodingError> decode(const Data& message, R& record) const {
    Document document;
    std::optional<DecodingError> rejection = read(message, document);
    if (rejection) return rejection;
    Decoding decoding{.document = document, .message = &message};
    if (!record.decode(Decoder(decoding))) rejection = std::move(decoding.rejection);
    return rejection;
  }
};

}  // namespace ironmoat::plist
