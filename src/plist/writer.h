#pragma once

#include "ironmoat/values.h"
#include "plist/document.h"

namespace ironmoat::plist {

/// The document as a property list that `read` and any other reader take back equal. Only kinds
/// that a record can hold are written: dictionary, array, string, data, integer, boolean; any other
/// throws std::invalid_argument.
///
/// XML cannot hold every text: characters that it excludes (U+0000, most other control characters,
/// U+FFFE, U+FFFF) throw std::invalid_argument from `writeXml`. No DOCTYPE is written.
Data writeBinary(const Document& document);
Data writeXml(const Document& document);

}  // namespace ironmoat::plist
