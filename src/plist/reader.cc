#include "plist/reader.h"

#include <string>

#include "ironmoat/errors.h"
#include "ironmoat/limits.h"

namespace ironmoat::plist {

void read(const Data& message, Document& document) {
  if (message.size() > limits::messageBytes) {
    throw DecodingError(DecodingError::Kind::limitExceeded, "",
                        "message of " + std::to_string(message.size()) + " bytes, more than " +
                            std::to_string(limits::messageBytes));
  }
  if (message.view().starts_with("bplist")) {
    readBinary(message, document);
  } else {
    readXml(message, document);
  }
}

}  // namespace ironmoat::plist
