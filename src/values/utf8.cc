#include "values/utf8.h"

#include <cstdint>
#include <cstring>

namespace ironmoat {

namespace {
constexpr std::uint64_t kHighBits = 0x8080808080808080U;
}

bool isAscii(std::string_view text) noexcept {
  if (text.size() < 8) return asciiPrefix(text) == text.size();
  std::uint64_t bits = 0;
  std::uint64_t word;
  for (std::size_t at = 0; at < text.size() - 8; at += 8) {
    std::memcpy(&word, text.data() + at, sizeof word);
    bits |= word;
  }
  std::memcpy(&word, text.data() + text.size() - 8, sizeof word);
  return ((bits | word) & kHighBits) == 0;
}

std::size_t asciiPrefix(std::string_view text) noexcept {
  std::size_t at = 0;
  for (; text.size() - at >= 16; at += 16) {
    std::uint64_t words[2];
    std::memcpy(words, text.data() + at, sizeof words);
    if (((words[0] | words[1]) & kHighBits) != 0) break;
  }
  while (at < text.size() && static_cast<unsigned char>(text[at]) < 0x80) ++at;
  return at;
}

std::size_t utf8SequenceLength(std::string_view text) noexcept {
  const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  const unsigned lead = byte(0);
  // The range of the second byte excludes overlong forms, surrogates and code points past U+10FFFF.
  unsigned low = 0x80;
  unsigned high = 0xBF;
  std::size_t length = 0;
  if (lead >= 0xC2 && lead <= 0xDF) {
    length = 2;
  } else if (lead >= 0xE0 && lead <= 0xEF) {
    length = 3;
    if (lead == 0xE0) low = 0xA0;
    if (lead == 0xED) high = 0x9F;
  } else if (lead >= 0xF0 && lead <= 0xF4) {
    length = 4;
    if (lead == 0xF0) low = 0x90;
    if (lead == 0xF4) high = 0x8F;
  }
  if (length == 0 || text.size() < length || byte(1) < low || byte(1) > high) return 0;
  for (std::size_t i = 2; i < length; ++i) {
    if ((byte(i) & 0xC0) != 0x80) return 0;
  }
  return length;
}

std::size_t validUtf8Prefix(std::string_view text) noexcept {
  std::size_t at = asciiPrefix(text);
  while (at < text.size()) {
    const std::size_t length = utf8SequenceLength(text.substr(at));
    if (length == 0) break;
    at += length;
    if (at < text.size() && static_cast<unsigned char>(text[at]) < 0x80) {
      at += asciiPrefix(text.substr(at));
    }
  }
  return at;
}

std::size_t writeUtf8(char32_t codePoint, char* out) noexcept {
  const auto put = [&](std::size_t i, char32_t bits) { out[i] = static_cast<char>(bits); };
  if (codePoint < 0x80) {
    put(0, codePoint);
    return 1;
  }
  if (codePoint < 0x800) {
    put(0, 0xC0 | (codePoint >> 6));
    put(1, 0x80 | (codePoint & 0x3F));
    return 2;
  }
  if (codePoint < 0x10000) {
    put(0, 0xE0 | (codePoint >> 12));
    put(1, 0x80 | ((codePoint >> 6) & 0x3F));
    put(2, 0x80 | (codePoint & 0x3F));
    return 3;
  }
  put(0, 0xF0 | (codePoint >> 18));
  put(1, 0x80 | ((codePoint >> 12) & 0x3F));
  put(2, 0x80 | ((codePoint >> 6) & 0x3F));
  put(3, 0x80 | (codePoint & 0x3F));
  return 4;
}

std::u16string utf16FromUtf8(std::string_view text) {
  std::u16string units;
  units.reserve(text.size());
  for (std::size_t at = 0; at < text.size();) {
    const auto lead = static_cast<unsigned char>(text[at++]);
    char32_t codePoint = lead;
    if (lead >= 0x80) {
      const int following = lead >= 0xF0 ? 3 : lead >= 0xE0 ? 2 : 1;
      codePoint = lead & (0x3FU >> following);
      for (int i = 0; i < following; ++i) {
        codePoint = codePoint << 6 | (static_cast<unsigned char>(text[at++]) & 0x3F);
      }
    }
    if (codePoint >= 0x10000) {
      units.push_back(static_cast<char16_t>(0xD800 + ((codePoint - 0x10000) >> 10)));
      units.push_back(static_cast<char16_t>(0xDC00 + (codePoint & 0x3FF)));
    } else {
      units.push_back(static_cast<char16_t>(codePoint));
    }
  }
  return units;
}

}  // namespace ironmoat
