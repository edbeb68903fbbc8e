#include "plist/base64.h"

#include <array>
#include <bit>
#include <cstdint>
#include <cstring>

#include "plist/xml_chars.h"

#if defined(__x86_64__)
#define IRONMOAT_HAS_SHUFFLES
#include <tmmintrin.h>
#endif

namespace ironmoat::plist {

namespace {

constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr std::uint32_t kForeign = 0x80000000U;  // apart from the 24 bits that values take

// The contribution of each character to the 24 bits of a group, for each of four positions.
constexpr auto kBits = [] {
  std::array<std::array<std::uint32_t, 256>, 4> bits{};
  for (std::size_t place = 0; place < 4; ++place) {
    bits[place].fill(kForeign);
    for (std::uint32_t value = 0; value < 64; ++value) {
      bits[place][static_cast<unsigned char>(kAlphabet[value])] = value << (18 - 6 * place);
    }
  }
  return bits;
}();

std::uint32_t groupBits(const char* four) noexcept {
  const auto at = [&](std::size_t i) { return static_cast<unsigned char>(four[i]); };
  return kBits[0][at(0)] | kBits[1][at(1)] | kBits[2][at(2)] | kBits[3][at(3)];
}

/// Writes six bytes, and two more that will be overwritten.
void putTwoGroups(std::uint32_t first, std::uint32_t second, char* out) noexcept {
  std::uint64_t bytes = (std::uint64_t{first} << 40) | (std::uint64_t{second} << 16);
  if constexpr (std::endian::native == std::endian::little) bytes = __builtin_bswap64(bytes);
  std::memcpy(out, &bytes, sizeof bytes);
}

char* putBytes(std::uint32_t group, unsigned count, char* out) noexcept {
  for (unsigned i = 0; i < count; ++i) *out++ = static_cast<char>(group >> (16 - 8 * i));
  return out;
}

const char* skipSpace(const char* at, const char* end) noexcept {
  while (at != end && isXmlSpace(*at)) ++at;
  return at;
}

#ifdef IRONMOAT_HAS_SHUFFLES
/// Decodes 16 characters into 12 bytes at a time while all 16 are in the alphabet. `low` and
/// `high`, indexed by a character's nibbles, have no common bit exactly for the alphabet.
/// `toValue`, indexed by the upper nibble (minus one for '/'), is the difference from a character
/// to its value.
///
/// A step writes 16 bytes, of which 12 count. It requires 24 more characters, for which `out` has
/// 18 bytes left and the 2 more that `decode` requires.
__attribute__((target("ssse3"))) void decodeSixteens(const char*& at, const char* end,
                                                     char*& out) noexcept {
  const __m128i low = _mm_setr_epi8(0x15, 0x11, 0x11, 0x11, 0x11, 0x11, 0x11, 0x11, 0x11, 0x11,
                                    0x13, 0x1A, 0x1B, 0x1B, 0x1B, 0x1A);
  const __m128i high = _mm_setr_epi8(0x10, 0x10, 0x01, 0x02, 0x04, 0x08, 0x04, 0x08, 0x10, 0x10,
                                     0x10, 0x10, 0x10, 0x10, 0x10, 0x10);
  const __m128i toValue = _mm_setr_epi8(0, 16, 19, 4, -65, -65, -71, -71, 0, 0, 0, 0, 0, 0, 0, 0);
  const __m128i inOrder = _mm_setr_epi8(2, 1, 0, 6, 5, 4, 10, 9, 8, 14, 13, 12, -1, -1, -1, -1);
  const __m128i nibble = _mm_set1_epi8(0x0F);
  for (; end - at >= 24; at += 16, out += 12) {
    const __m128i text = _mm_loadu_si128(reinterpret_cast<const __m128i*>(at));
    const __m128i upper = _mm_and_si128(_mm_srli_epi32(text, 4), nibble);
    const __m128i foreign = _mm_and_si128(_mm_shuffle_epi8(low, _mm_and_si128(text, nibble)),
                                          _mm_shuffle_epi8(high, upper));
    if (_mm_movemask_epi8(_mm_cmpeq_epi8(foreign, _mm_setzero_si128())) != 0xFFFF) return;
    const __m128i isSlash = _mm_cmpeq_epi8(text, _mm_set1_epi8('/'));
    const __m128i values =
        _mm_add_epi8(text, _mm_shuffle_epi8(toValue, _mm_add_epi8(isSlash, upper)));
    // 6 bits each to 12 to 24.
    const __m128i pairs = _mm_maddubs_epi16(values, _mm_set1_epi32(0x01400140));
    const __m128i groups = _mm_madd_epi16(pairs, _mm_set1_epi32(0x00011000));
    _mm_storeu_si128(reinterpret_cast<__m128i*>(out), _mm_shuffle_epi8(groups, inOrder));
  }
}
#else
void decodeSixteens(const char*&, const char*, char*&) noexcept {}
#endif

/// Decodes to `out`, which must have 3 bytes for each 4 characters or part of them, and 2 more;
/// moves `out` past the result. Returns null, or the position of the first invalid character.
const char* decode(const char* at, const char* end, char*& out, Base64Way way) noexcept {
  for (;;) {
    at = skipSpace(at, end);  // usually between two lines
    if (way == Base64Way::shuffles) decodeSixteens(at, end, out);
    for (; end - at >= 8; at += 8, out += 6) {
      const std::uint32_t first = groupBits(at);
      const std::uint32_t second = groupBits(at + 4);
      if (((first | second) & kForeign) != 0) break;
      putTwoGroups(first, second, out);
    }
    // The last four of a line, before white space.
    if (end - at >= 4) {
      const std::uint32_t group = groupBits(at);
      if ((group & kForeign) == 0) {
        out = putBytes(group, 3, out);
        at += 4;
        continue;
      }
    }
    // One group character by character: near white space, padding, a foreign character or the end.
    std::uint32_t group = 0;
    unsigned place = 0;
    for (; place < 4; ++place, ++at) {
      at = skipSpace(at, end);
      if (at == end) break;
      const std::uint32_t bits = kBits[place][static_cast<unsigned char>(*at)];
      if (bits == kForeign) break;
      group |= bits;
    }
    if (place == 4) {
      out = putBytes(group, 3, out);
      continue;
    }
    if (place == 0) return at == end ? nullptr : at;
    const unsigned count = place - 1;  // bytes in the last group
    if (count == 0 || (group & (0xFFFFFFU >> (8 * count))) != 0) return at;
    for (; place < 4; ++place, ++at) {
      at = skipSpace(at, end);
      if (at == end || *at != '=') return at;
    }
    out = putBytes(group, count, out);
    at = skipSpace(at, end);
    return at == end ? nullptr : at;
  }
}

}  // namespace

Base64Way fastestBase64Way() noexcept {
#ifdef IRONMOAT_HAS_SHUFFLES
  if (__builtin_cpu_supports("ssse3")) return Base64Way::shuffles;
#endif
  return Base64Way::tables;
}

std::optional<std::size_t> decodeBase64(std::string_view text, BlockBuilder& out, Base64Way way) {
  if (text.empty()) return {};
  const std::size_t before = out.size();
  char* const start = out.extend((text.size() + 3) / 4 * 3 + 2);
  char* end = start;
  const char* wrong = decode(text.data(), text.data() + text.size(), end, way);
  out.truncate(wrong == nullptr ? before + static_cast<std::size_t>(end - start) : before);
  if (wrong == nullptr) return {};
  return static_cast<std::size_t>(wrong - text.data());
}

void encodeBase64(std::string_view bytes, BlockBuilder& out) {
  const auto byte = [&](std::size_t i) {
    return i < bytes.size() ? std::uint32_t{static_cast<unsigned char>(bytes[i])} : 0;
  };
  char* to = bytes.empty() ? nullptr : out.extend((bytes.size() + 2) / 3 * 4);
  for (std::size_t i = 0; i < bytes.size(); i += 3) {
    const std::uint32_t group = (byte(i) << 16) | (byte(i + 1) << 8) | byte(i + 2);
    *to++ = kAlphabet[group >> 18];
    *to++ = kAlphabet[(group >> 12) & 63];
    *to++ = i + 1 < bytes.size() ? kAlphabet[(group >> 6) & 63] : '=';
    *to++ = i + 2 < bytes.size() ? kAlphabet[group & 63] : '=';
  }
}

}  // namespace ironmoat::plist
