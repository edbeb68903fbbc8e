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
  /// Into `record`, freshly made, by its `decode`. Returns why the message is refused; the record
  /// is then useless. None: the record keeps a reference to the message's block, and depends on
  /// nothing else.
  template <class R>
  [[nodiscard]] std::optional<DecodingError> decode(const Data& message, R& record) const {
    Document document;
    std::optional<DecodingError> refusal = read(message, document);
    if (refusal) return refusal;
    Decoding decoding{.document = document, .message = &message};
    if (!record.decode(Decoder(decoding))) refusal = std::move(decoding.refusal);
    return refusal;
  }
};

}  // namespace ironmoat::plist
