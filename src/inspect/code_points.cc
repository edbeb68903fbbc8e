#include "inspect/code_points.h"

#include <algorithm>
#include <array>
#include <span>

namespace ironmoat::inspect {

namespace {

struct Lead {
  std::size_t length;  // 0: no sequence starts so
  unsigned char low;   // what the second byte may be
  unsigned char high;
};

// Narrower bounds of the second byte shut out overlong forms, surrogates and what is past U+10FFFF.
Lead leadOf(unsigned char byte) noexcept {
  if (byte < 0x80) return {1, 0, 0};
  if (byte < 0xC2) return {0, 0, 0};
  if (byte < 0xE0) return {2, 0x80, 0xBF};
  if (byte < 0xF0) {
    const unsigned char low = byte == 0xE0 ? 0xA0 : 0x80;
    const unsigned char high = byte == 0xED ? 0x9F : 0xBF;
    return {3, low, high};
  }
  if (byte < 0xF5) {
    const unsigned char low = byte == 0xF0 ? 0x90 : 0x80;
    const unsigned char high = byte == 0xF4 ? 0x8F : 0xBF;
    return {4, low, high};
  }
  return {0, 0, 0};
}

struct Range {
  char32_t first;
  char32_t last;
};

bool isIn(std::span<const Range> ranges, char32_t value) noexcept {
  return std::any_of(ranges.begin(), ranges.end(),
                     [value](Range range) { return value >= range.first && value <= range.last; });
}

}  // namespace

CodePoint firstCodePoint(std::string_view text) noexcept {
  const auto byteAt = [text](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  const Lead lead = leadOf(byteAt(0));
  if (lead.length == 0) return {kReplacement, 1, false};
  if (lead.length == 1) return {byteAt(0), 1, true};
  char32_t value = byteAt(0) & (0x7FU >> lead.length);
  for (std::size_t i = 1; i < lead.length; ++i) {
    const unsigned char low = i == 1 ? lead.low : 0x80;
    const unsigned char high = i == 1 ? lead.high : 0xBF;
    if (i == text.size() || byteAt(i) < low || byteAt(i) > high) return {kReplacement, i, false};
    value = (value << 6U) | (byteAt(i) & 0x3FU);
  }
  return {value, lead.length, true};
}

bool isControl(char32_t value) noexcept {
  return value < 0x20 || (value >= 0x7F && value < 0xA0) || value == 0x2028 || value == 0x2029;
}

bool isInvisible(char32_t value) noexcept {
  static constexpr std::array<Range, 10> kRanges = {{
      {0x00AD, 0x00AD},    // soft hyphen
      {0x061C, 0x061C},    // reading direction, also below
      {0x180E, 0x180E},    // vowel separator
      {0x200B, 0x200B},    // space of no width; its joining neighbours belong to visible text
      {0x200E, 0x200F},    //
      {0x202A, 0x202E},    //
      {0x2060, 0x206F},    // joiners, isolates, invisible operators
      {0xFEFF, 0xFEFF},    // byte-order mark
      {0xFFF9, 0xFFFB},    // annotations
      {0xE0000, 0xE0FFF},  // tags
  }};
  return isControl(value) || isIn(kRanges, value);
}

std::size_t columnsOf(char32_t value) noexcept {
  static constexpr std::array<Range, 4> kMarks = {
      {{0x0300, 0x036F}, {0x200C, 0x200D}, {0x20D0, 0x20FF}, {0xFE00, 0xFE0F}}};
  static constexpr std::array<Range, 9> kWide = {{{0x1100, 0x115F},
                                                  {0x2E80, 0x303E},
                                                  {0x3041, 0xA4CF},
                                                  {0xAC00, 0xD7A3},
                                                  {0xF900, 0xFAFF},
                                                  {0xFE30, 0xFE6F},
                                                  {0xFF01, 0xFF60},
                                                  {0x1F300, 0x1FAFF},
                                                  {0x20000, 0x3FFFD}}};
  return isIn(kMarks, value) ? 0 : isIn(kWide, value) ? 2 : 1;
}

}  // namespace ironmoat::inspect
