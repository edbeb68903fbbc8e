#pragma once

#include <string_view>

#include "plist/document_builder.h"

namespace ironmoat::plist {

/// The text of scalar elements, white space around it allowed. False when it is no such value.
/// Linear in the text.

/// Decimal or, after 0x, hexadecimal digits with an optional sign, in -2^63 to 2^64 - 1; added as
/// an integer, or past 2^63 - 1 as an unsigned one.
[[nodiscard]] bool addInteger(std::string_view text, DocumentBuilder& builder);

/// A decimal fraction with an optional exponent, infinity or "nan"; no field takes its value.
[[nodiscard]] bool isReal(std::string_view text) noexcept;

/// YYYY-MM-DDThh:mm:ssZ.
[[nodiscard]] bool isDate(std::string_view text) noexcept;

}  // namespace ironmoat::plist
