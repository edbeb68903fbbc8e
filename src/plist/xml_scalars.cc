#include "plist/xml_scalars.h"

#include <algorithm>
#include <charconv>
#include <cstdint>

#include "plist/xml_chars.h"

namespace ironmoat::plist {

namespace {

bool isDigit(char c) noexcept { return c >= '0' && c <= '9'; }

std::string_view trimmed(std::string_view text) noexcept {
  while (!text.empty() && isXmlSpace(text.front())) text.remove_prefix(1);
  while (!text.empty() && isXmlSpace(text.back())) text.remove_suffix(1);
  return text;
}

/// Removes a sign; returns whether it was a minus.
bool takeSign(std::string_view& text) noexcept {
  const bool negative = text.starts_with('-');
  if (negative || text.starts_with('+')) text.remove_prefix(1);
  return negative;
}

/// Removes leading digits; returns whether there were any.
bool takeDigits(std::string_view& text) noexcept {
  const auto end = std::find_if_not(text.begin(), text.end(), isDigit);
  const auto count = static_cast<std::size_t>(end - text.begin());
  text.remove_prefix(count);
  return count != 0;
}

/// `word` must be in lower case.
bool isWord(std::string_view text, std::string_view word) noexcept {
  return std::equal(text.begin(), text.end(), word.begin(), word.end(),
                    [](char c, char lower) { return (c | 0x20) == lower; });
}

}  // namespace

bool addInteger(std::string_view text, DocumentBuilder& builder) {
  text = trimmed(text);
  const bool negative = takeSign(text);
  const bool hexadecimal = text.starts_with("0x") || text.starts_with("0X");
  if (hexadecimal) text.remove_prefix(2);
  std::uint64_t magnitude = 0;
  const char* const end = text.data() + text.size();
  const auto [stopped, error] = std::from_chars(text.data(), end, magnitude, hexadecimal ? 16 : 10);
  if (error == std::errc::invalid_argument || stopped != end) return false;
  constexpr std::uint64_t kMinimum = std::uint64_t{1} << 63;
  if (error != std::errc() || magnitude > (negative ? kMinimum : kMinimum - 1)) {
    builder.opaque(Kind::wideInteger);
  } else {
    builder.integer(static_cast<std::int64_t>(negative ? 0 - magnitude : magnitude));
  }
  return true;
}

bool isReal(std::string_view text) noexcept {
  text = trimmed(text);
  takeSign(text);
  if (isWord(text, "nan") || isWord(text, "inf") || isWord(text, "infinity")) return true;
  bool digits = takeDigits(text);
  if (text.starts_with('.')) {
    text.remove_prefix(1);
    digits = takeDigits(text) || digits;
  }
  if (!digits) return false;
  if (text.starts_with('e') || text.starts_with('E')) {
    text.remove_prefix(1);
    takeSign(text);
    if (!takeDigits(text)) return false;
  }
  return text.empty();
}

bool isDate(std::string_view text) noexcept {
  constexpr std::string_view kShape = "dddd-dd-ddTdd:dd:ddZ";
  text = trimmed(text);
  return std::equal(text.begin(), text.end(), kShape.begin(), kShape.end(),
                    [](char c, char shape) { return shape == 'd' ? isDigit(c) : c == shape; });
}

}  // namespace ironmoat::plist
