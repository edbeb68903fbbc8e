#pragma once

#include "ironmoat/values.h"
#include "plist/document.h"

namespace ironmoat::plist {

/// Reads a whole property list into `document`, which must be empty: binary when the bytes begin
/// with "bplist", XML otherwise. The document holds the message's block and copies nothing that the
/// message has literally.
///
/// Throws DecodingError, `malformed` with an offset into `message` or `limitExceeded`; the document
/// is then useless. Time is linear in the size of the message.
void read(const Data& message, Document& document);

/// One form each, for tests. Requires at most limits::messageBytes.
void readBinary(const Data& message, Document& document);
void readXml(const Data& message, Document& document);

}  // namespace ironmoat::plist
