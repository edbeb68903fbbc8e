#pragma once

#include "ironmoat/values.h"
#include "plist/document.h"

namespace ironmoat::plist {

/// Write the document as a property list from which `read` makes an equal document. Throw
/// std::invalid_argument for kinds that no record holds: only dictionary, array, string, data,
/// integer and boolean are written.
///
/// writeXml also throws std::invalid_argument for text with characters that XML excludes (U+0000,
/// other control characters but tab, LF and CR, U+FFFE, U+FFFF). It writes no DOCTYPE.
Data writeBinary(const Document& document);
Data writeXml(const Document& document);

}  // namespace ironmoat::plist
