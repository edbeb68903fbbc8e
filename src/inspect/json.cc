#include "inspect/json.h"

#include <array>

#include "inspect/code_points.h"

namespace ironmoat::inspect {

namespace {

constexpr std::string_view kHexDigits = "0123456789abcdef";

void appendEscape(std::string& out, char32_t value) {
  switch (value) {
    case '"':
      out += "\\\"";
      return;
    case '\\':
      out += "\\\\";
      return;
    case '\n':
      out += "\\n";
      return;
    case '\r':
      out += "\\r";
      return;
    case '\t':
      out += "\\t";
      return;
    default:  // every other one that is escaped is below U+10000
      out += "\\u";
      for (int shift = 12; shift >= 0; shift -= 4) out += kHexDigits[(value >> shift) & 0xF];
  }
}

bool isPlain(char c) noexcept { return c >= ' ' && c <= '~' && c != '"' && c != '\\'; }

}  // namespace

void appendJsonText(std::string& out, std::string_view text) {
  out += '"';
  std::size_t copied = 0;  // text before this is in `out`
  std::size_t at = 0;
  while (at < text.size()) {
    if (isPlain(text[at])) {
      ++at;
      continue;
    }
    const CodePoint point = firstCodePoint(text.substr(at));
    const bool escaped = isControl(point.value) || point.value == '"' || point.value == '\\';
    if (escaped || !point.wellFormed) {
      out += text.substr(copied, at - copied);
      if (escaped) {
        appendEscape(out, point.value);
      } else {
        out += "\xEF\xBF\xBD";
      }
      copied = at + point.length;
    }
    at += point.length;
  }
  out += text.substr(copied);
  out += '"';
}

void appendJsonBytes(std::string& out, std::span<const std::uint8_t> bytes) {
  static constexpr std::string_view kDigits =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  out += '"';
  while (!bytes.empty()) {
    const std::size_t count = bytes.size() < 3 ? bytes.size() : 3;
    std::uint32_t group = 0;
    for (std::size_t i = 0; i < 3; ++i) group = (group << 8U) | (i < count ? bytes[i] : 0U);
    std::array<char, 4> digits = {kDigits[group >> 18U], kDigits[(group >> 12U) & 63U],
                                  kDigits[(group >> 6U) & 63U], kDigits[group & 63U]};
    for (std::size_t i = count + 1; i < digits.size(); ++i) digits[i] = '=';
    out.append(digits.data(), digits.size());
    bytes = bytes.subspan(count);
  }
  out += '"';
}

}  // namespace ironmoat::inspect
