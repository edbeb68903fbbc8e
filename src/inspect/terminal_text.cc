#include "inspect/terminal_text.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>

#include "values/utf8.h"

namespace ironmoat::inspect {

namespace {

struct Range {
  char32_t first;
  char32_t last;
};

// Ranges besides the controls.
constexpr Range kInvisible[] = {
    {0x00AD, 0x00AD},    // soft hyphen
    {0x061C, 0x061C},    // reading direction, like U+200E to U+202E
    {0x180E, 0x180E},    // vowel separator
    {0x200B, 0x200B},    // zero-width space; its joining neighbours belong to visible text
    {0x200E, 0x200F},    //
    {0x202A, 0x202E},    //
    {0x2060, 0x206F},    // joiners, isolates, invisible operators
    {0xFEFF, 0xFEFF},    // byte-order mark
    {0xFFF9, 0xFFFB},    // annotations
    {0xE0000, 0xE0FFF},  // tags
};
constexpr Range kCombining[] = {
    {0x0300, 0x036F}, {0x200C, 0x200D}, {0x20D0, 0x20FF}, {0xFE00, 0xFE0F}};
constexpr Range kWide[] = {{0x1100, 0x115F}, {0x2E80, 0x303E},   {0x3041, 0xA4CF},
                           {0xAC00, 0xD7A3}, {0xF900, 0xFAFF},   {0xFE30, 0xFE6F},
                           {0xFF01, 0xFF60}, {0x1F300, 0x1FAFF}, {0x20000, 0x3FFFD}};

template <std::size_t N>
bool isIn(const Range (&ranges)[N], char32_t value) noexcept {
  return std::any_of(std::begin(ranges), std::end(ranges),
                     [value](Range range) { return value >= range.first && value <= range.last; });
}

/// A colour or a character, which must not be split: its bytes and columns.
struct Unit {
  std::size_t length;
  std::size_t columns;
};

Unit firstUnit(std::string_view text) noexcept {
  if (text.front() == '\033') return {text.find('m') + 1, 0};
  const CodePoint point = firstCodePoint(text);
  const std::size_t columns = isIn(kCombining, point.value) ? 0 : isIn(kWide, point.value) ? 2 : 1;
  return {point.length, columns};
}

}  // namespace

std::string formatted(const char* format, ...) {
  char text[128];
  va_list values;
  va_start(values, format);
  const int size = std::vsnprintf(text, sizeof text, format, values);
  va_end(values);
  return {text, std::min(static_cast<std::size_t>(std::max(size, 0)), sizeof text - 1)};
}

CodePoint firstCodePoint(std::string_view text) noexcept {
  const auto first = static_cast<unsigned char>(text.front());
  if (first < 0x80) return {first, 1, true};
  const std::size_t length = utf8SequenceLength(text);
  if (length == 0) return {first, 1, false};
  char32_t value = first & (0x7FU >> length);
  for (const char byte : text.substr(1, length - 1)) value = value << 6U | (byte & 0x3F);
  return {value, length, true};
}

bool isControl(char32_t value) noexcept {
  return value < 0x20 || (value >= 0x7F && value < 0xA0) || value == 0x2028 || value == 0x2029;
}

void appendEscaped(std::string& out, std::string_view text) {
  while (!text.empty()) {
    const CodePoint point = firstCodePoint(text);
    if (point.value == '\n' || point.value == '\t' || point.value == '\r') {
      out += point.value == '\n' ? "\\n" : point.value == '\t' ? "\\t" : "\\r";
    } else if (!point.wellFormed || isControl(point.value) || isIn(kInvisible, point.value)) {
      out +=
          formatted(point.wellFormed ? "\\u{%x}" : "\\x{%x}", static_cast<unsigned>(point.value));
    } else {
      out += text.substr(0, point.length);
    }
    text.remove_prefix(point.length);
  }
}

std::string inQuotes(std::string_view text) {
  std::string out = "'";
  appendEscaped(out, text);
  return out += '\'';
}

std::size_t columnsOf(std::string_view text) noexcept {
  std::size_t columns = 0;
  while (!text.empty()) {
    const Unit unit = firstUnit(text);
    columns += unit.columns;
    text.remove_prefix(unit.length);
  }
  return columns;
}

void appendWrapped(std::string& out, std::string_view text, std::size_t column, std::size_t indent,
                   std::size_t width) {
  const auto breakLine = [&] {
    out.append(1, '\n').append(indent, ' ');
    column = indent;
  };
  for (bool first = true; first || !text.empty(); first = false) {
    if (!first) text.remove_prefix(1);
    std::string_view word = text.substr(0, text.find('\n'));
    text.remove_prefix(word.size());
    const std::size_t columns = columnsOf(word);
    if (!first && width != 0 && column + 1 + columns > width) {
      breakLine();
    } else if (!first) {
      out += ' ';
      ++column;
    }
    while (!word.empty()) {
      const Unit unit = firstUnit(word);
      if (width != 0 && column + unit.columns > width && column > indent) breakLine();
      out += word.substr(0, unit.length);
      column += unit.columns;
      word.remove_prefix(unit.length);
    }
  }
}

}  // namespace ironmoat::inspect
