#pragma once

#include <optional>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"
#include "plist/document.h"

namespace ironmoat::plist {

/// Reads a whole property list into `document`, which must be empty. The format is binary if the
/// bytes begin with "bplist", otherwise XML. The document holds a reference to the message's block,
/// and copies only bytes that are transformed. Takes time linear in the size of the message.
///
/// Returns the rejection if there is one: `malformed` with an offset, or `limitExceeded`. The
/// document must then not be used.
[[nodiscard]] std::optional<DecodingError> read(const Data& message, Document& document);

/// Read one format each. Require at most limits::messageBytes. For tests.
[[nodiscard]] std::optional<DecodingError> readBinary(const Data& message, Document& document);
[[nodiscard]] std::optional<DecodingError> readXml(const Data& message, Document& document);

}  // namespace ironmoat::plist
