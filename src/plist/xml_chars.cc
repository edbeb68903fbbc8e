#include "plist/xml_chars.h"

#include <algorithm>

#include "values/utf8.h"

namespace ironmoat::plist {

namespace {

/// Whether valid UTF-8 past ASCII is not an XML character: U+FFFE or U+FFFF.
bool isNoncharacter(const char* sequence, std::size_t length) noexcept {
  return length == 3 && std::memcmp(sequence, "\xEF\xBF", 2) == 0 &&
         static_cast<unsigned char>(sequence[2]) >= 0xBE;
}

/// The first byte that is neither printable ASCII nor white space, or `end`.
const char* skipPlainAscii(const char* at, const char* end) noexcept {
#if defined(__SSE2__)
  for (; end - at >= 16; at += 16) {
    const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i*>(at));
    const auto are = [&](char c) { return _mm_cmpeq_epi8(bytes, _mm_set1_epi8(c)); };
    // The comparison is signed: bytes from 0x80 are less than a space.
    const __m128i low = _mm_cmplt_epi8(bytes, _mm_set1_epi8(' '));
    const __m128i space = _mm_or_si128(_mm_or_si128(are('\t'), are('\n')), are('\r'));
    const auto mask = static_cast<unsigned>(_mm_movemask_epi8(_mm_andnot_si128(space, low)));
    if (mask != 0) return at + std::countr_zero(mask);
  }
#endif
  const auto plain = [](char c) {
    return (static_cast<unsigned char>(c) >= ' ' && static_cast<unsigned char>(c) < 0x80) ||
           isXmlSpace(c);
  };
  // The rest, or all of it without SSE2: by words, and words with white space by bytes.
  for (; end - at >= 8; at += 8) {
    std::uint64_t bytes;
    std::memcpy(&bytes, at, sizeof bytes);
    constexpr std::uint64_t kOnes = 0x0101010101010101U;
    const std::uint64_t low = (bytes - kOnes * ' ') & ~bytes;
    if (((low | bytes) & (kOnes << 7)) != 0 && !std::all_of(at, at + 8, plain)) break;
  }
  while (at != end && plain(*at)) ++at;
  return at;
}

struct Range {
  char32_t first;
  char32_t last;
};

constexpr Range kNameStart[] = {
    {':', ':'},       {'A', 'Z'},       {'_', '_'},       {'a', 'z'},
    {0xC0, 0xD6},     {0xD8, 0xF6},     {0xF8, 0x2FF},    {0x370, 0x37D},
    {0x37F, 0x1FFF},  {0x200C, 0x200D}, {0x2070, 0x218F}, {0x2C00, 0x2FEF},
    {0x3001, 0xD7FF}, {0xF900, 0xFDCF}, {0xFDF0, 0xFFFD}, {0x10000, 0xEFFFF},
};
constexpr Range kNameFurther[] = {
    {'-', '.'}, {'0', '9'}, {0xB7, 0xB7}, {0x300, 0x36F}, {0x203F, 0x2040},
};

template <std::size_t Count>
bool contains(const Range (&ranges)[Count], char32_t c) noexcept {
  return std::any_of(ranges, ranges + Count,
                     [c](const Range& range) { return range.first <= c && c <= range.last; });
}

/// The code point of a well-formed sequence.
char32_t decodeSequence(std::string_view sequence) noexcept {
  const auto lead = static_cast<unsigned char>(sequence[0]);
  if (sequence.size() == 1) return lead;
  char32_t c = lead & (0x7FU >> sequence.size());
  for (const char byte : sequence.substr(1)) c = (c << 6) | (static_cast<unsigned char>(byte) & 63);
  return c;
}

}  // namespace

std::size_t xmlTextPrefix(std::string_view text) noexcept {
  const char* const end = text.data() + text.size();
  const char* at = text.data();
  for (;;) {
    at = skipPlainAscii(at, end);
    if (at == end || static_cast<unsigned char>(*at) < 0x80) break;
    do {
      const auto left = static_cast<std::size_t>(end - at);
      const std::size_t length = utf8SequenceLength({at, left});
      if (length == 0 || isNoncharacter(at, length)) {
        return static_cast<std::size_t>(at - text.data());
      }
      at += length;
    } while (at != end && static_cast<unsigned char>(*at) >= 0x80);
  }
  return static_cast<std::size_t>(at - text.data());
}

std::size_t xmlNameLength(std::string_view text) noexcept {
  std::size_t at = 0;
  while (at < text.size()) {
    const bool ascii = static_cast<unsigned char>(text[at]) < 0x80;
    const std::size_t length = ascii ? 1 : utf8SequenceLength(text.substr(at));
    const char32_t c = decodeSequence(text.substr(at, length));
    if (!contains(kNameStart, c) && (at == 0 || !contains(kNameFurther, c))) break;
    at += length;
  }
  return at;
}

}  // namespace ironmoat::plist
