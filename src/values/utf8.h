#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace ironmoat {

/// The number of leading ASCII bytes.
std::size_t asciiPrefix(std::string_view text) noexcept;

bool isAscii(std::string_view text) noexcept;

/// Length in bytes of the longest prefix that is well-formed UTF-8: no surrogates, no overlong
/// forms, nothing past U+10FFFF.
std::size_t validUtf8Prefix(std::string_view text) noexcept;

inline bool isValidUtf8(std::string_view text) noexcept {
  return validUtf8Prefix(text) == text.size();
}

/// Length in bytes of the well-formed UTF-8 sequence at the start of `text`, which begins with a
/// byte of 0x80 or more; 0 when there is none.
std::size_t utf8SequenceLength(std::string_view text) noexcept;

/// Writes `codePoint` (a Unicode scalar value) as UTF-8 to `out`, which must have 4 bytes;
/// returns the bytes written.
std::size_t writeUtf8(char32_t codePoint, char* out) noexcept;

/// Requires well-formed UTF-8.
std::u16string utf16FromUtf8(std::string_view text);

}  // namespace ironmoat
