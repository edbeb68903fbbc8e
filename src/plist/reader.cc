#include "plist/reader.h"

#include <string>

#include "ironmoat/limits.h"

namespace ironmoat::plist {

std::optional<DecodingError> read(const Data& message, Document& document) {
  if (message.size() > limits::messageBytes) {
    return DecodingError(DecodingError::Kind::limitExceeded, "",
                         "message size exceeds the limit of " +
                             std::to_string(limits::messageBytes) +
                             " bytes: " + std::to_string(message.size()));
  }
  return message.view().starts_with("bplist") ? readBinary(message, document)
                                              : readXml(message, document);
}

}  // namespace ironmoat::plist
