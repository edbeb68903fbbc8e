#pragma once

#include <string_view>

#include "plist/document_builder.h"

namespace ironmoat::plist {

// Functions for the text of scalar elements. All ignore surrounding white space, return false for
// text that is not a valid value, and take time linear in the text.

/// Decimal or, after 0x, hexadecimal digits with an optional sign, in -2^63 to 2^64 - 1; added as
/// an integer, or past 2^63 - 1 as an unsigned one.
[[nodiscard]] bool addInteger(std::string_view text, DocumentBuilder& builder);

/// Whether the text is a decimal fraction with an optional exponent, infinity or "nan".
[[nodiscard]] bool isReal(std::string_view text) noexcept;

/// Whether the text has the form YYYY-MM-DDThh:mm:ssZ.
[[nodiscard]] bool isDate(std::string_view text) noexcept;

}  // namespace ironmoat::plist
