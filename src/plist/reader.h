#pragma once

#include <optional>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"
#include "plist/document.h"

namespace ironmoat::plist {

/// Reads a whole property list into `document`, which must be empty: binary when the bytes begin
/// with "bplist", XML otherwise. The document holds the message's block and copies nothing that the
/// message has literally.
///
/// Returns why the message is rejected, `malformed` with an offset into it or `limitExceeded`; the
/// document is then useless. None: it was read. Time is linear in the size of the message.
[[nodiscard]] std::optional<DecodingError> read(const Data& message, Document& document);

/// One form each, for tests. Requires at most limits::messageBytes.
[[nodiscard]] std::optional<DecodingError> readBinary(const Data& message, Document& document);
[[nodiscard]] std::optional<DecodingError> readXml(const Data& message, Document& document);

}  // namespace ironmoat::plist
