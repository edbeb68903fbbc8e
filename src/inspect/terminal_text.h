#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace ironmoat::inspect {

/// Terminal sequences for parts of the output; all empty without a terminal.
struct Colours {
  std::string_view title;
  std::string_view label;
  std::string_view aside;
  std::string_view error;
  std::string_view end;

  static constexpr Colours none() { return {}; }
  static constexpr Colours muted() {
    return {"\033[1m", "\033[36m", "\033[2m", "\033[31m", "\033[0m"};
  }
};

struct Style {
  Colours colours = Colours::none();
  std::size_t width = 0;  ///< columns of the screen; 0: lines may have any length
};

/// Formats as printf does, up to 127 bytes.
[[gnu::format(printf, 1, 2)]] std::string formatted(const char* format, ...);

struct CodePoint {
  char32_t value;
  std::size_t length;  ///< bytes in the text
  bool wellFormed;     ///< if false, `value` is a byte that does not start well-formed UTF-8
};

/// The code point at the start of `text`. Requires a text that is not empty; its bytes, as those of
/// file names, may be invalid.
CodePoint firstCodePoint(std::string_view text) noexcept;

/// True for characters that can end a line or control a terminal: C0, DEL, C1, line and paragraph
/// separators.
bool isControl(char32_t value) noexcept;

/// Appends `text` and escapes invisible characters, so that it cannot control a terminal: `\n`,
/// `\u{202e}`, or `\x{ff}` for a byte that is not UTF-8.
void appendEscaped(std::string& out, std::string_view text);
/// The escaped text in single quotes.
std::string inQuotes(std::string_view text);

/// Columns of escaped text on a terminal: two for East Asian characters, none for combining marks
/// and colours.
std::size_t columnsOf(std::string_view text) noexcept;

/// Appends escaped text, which starts in `column`, in lines of at most `width` columns (0: any
/// length). Further lines start in column `indent`. A line feed in `text` is a space that may
/// become a line break; text without them is broken between any two characters.
void appendWrapped(std::string& out, std::string_view text, std::size_t column, std::size_t indent,
                   std::size_t width);

}  // namespace ironmoat::inspect
