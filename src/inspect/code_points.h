#pragma once

#include <cstddef>
#include <string_view>

namespace ironmoat::inspect {

inline constexpr char32_t kReplacement = 0xFFFD;

struct CodePoint {
  char32_t value;
  std::size_t length;  ///< bytes it takes in the text; at least 1
  bool wellFormed;     ///< if not, `value` is U+FFFD and stands for `length` broken bytes
};

/// The code point at the start of `text`, which is not empty and may be any bytes: file names are.
CodePoint firstCodePoint(std::string_view text) noexcept;

/// Control characters of any kind, and line and paragraph separators: what can end a line or steer
/// a terminal.
bool isControl(char32_t value) noexcept;

/// Not seen as itself on a screen: controls, marks that reverse the reading direction, code points
/// without width.
bool isInvisible(char32_t value) noexcept;

/// Columns of a terminal that a visible one takes: 0 for marks on the character before, 2 for most
/// of what East Asia writes with and for pictures, 1 for all others. Roughly.
std::size_t columnsOf(char32_t value) noexcept;

}  // namespace ironmoat::inspect
