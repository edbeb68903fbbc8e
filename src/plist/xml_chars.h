#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace ironmoat::plist {

/// XML's white space: space, tab, CR, LF.
constexpr bool isXmlSpace(char c) noexcept {
  return c == ' ' || c == '\n' || c == '\t' || c == '\r';
}

/// Whether XML 1.0 allows the character, literally or as a reference.
constexpr bool isXmlCharacter(char32_t c) noexcept {
  if (c < 0x20) return c == '\t' || c == '\n' || c == '\r';
  return c < 0xD800 || (c >= 0xE000 && c <= 0x10FFFF && c != 0xFFFE && c != 0xFFFF);
}

/// Length in bytes of the longest prefix that is well-formed UTF-8 and has only XML characters.
std::size_t xmlTextPrefix(std::string_view text) noexcept;

/// Length in bytes of the XML name at the start of `text`, which must be valid UTF-8; 0 if there is
/// none.
std::size_t xmlNameLength(std::string_view text) noexcept;

/// The first '<', '&', ']' or CR, or `end`.
inline const char* findTextStop(const char* at, const char* end) noexcept {
#if defined(__SSE2__)
  for (; end - at >= 16; at += 16) {
    const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i*>(at));
    const auto are = [&](char c) { return _mm_cmpeq_epi8(bytes, _mm_set1_epi8(c)); };
    const __m128i stops =
        _mm_or_si128(_mm_or_si128(are('<'), are('&')), _mm_or_si128(are(']'), are('\r')));
    const auto mask = static_cast<unsigned>(_mm_movemask_epi8(stops));
    if (mask != 0) return at + std::countr_zero(mask);
  }
#endif
  // The rest, or all of it without SSE2: words without a stop, then bytes.
  for (; end - at >= 8; at += 8) {
    std::uint64_t bytes;
    std::memcpy(&bytes, at, sizeof bytes);
    constexpr std::uint64_t kOnes = 0x0101010101010101U;
    const auto holds = [&](char c) {
      const std::uint64_t zeroWhereEqual = bytes ^ (kOnes * static_cast<unsigned char>(c));
      return (zeroWhereEqual - kOnes) & ~zeroWhereEqual & (kOnes << 7);
    };
    if ((holds('<') | holds('&') | holds(']') | holds('\r')) != 0) break;
  }
  while (at != end && *at != '<' && *at != '&' && *at != ']' && *at != '\r') ++at;
  return at;
}

}  // namespace ironmoat::plist
