#include "inspect/text_view.h"

namespace ironmoat::inspect {

namespace {

constexpr std::size_t kBytesShown = 32;
constexpr std::size_t kBytesInGroup = 4;
constexpr std::size_t kTextShown = 400;  // bytes

std::string counted(std::size_t number, std::string_view unit) {
  return std::to_string(number).append(" ").append(unit).append(number == 1 ? "" : "s");
}

std::string cutRemark(std::size_t shown, std::size_t size) {
  return "... the first " + std::to_string(shown) + " of " + counted(size, "byte");
}

}  // namespace

// Also escapes quotes and backslashes, so that no text looks like other output of the view.
std::string TextView::shown(const String& value) const {
  const std::string_view text = value.view();
  std::string out = "\"";
  std::size_t shown = 0;
  while (shown < text.size() && shown < kTextShown) {
    const std::string_view character =
        text.substr(shown, firstCodePoint(text.substr(shown)).length);
    if (character == "\"" || character == "\\") out += '\\';
    appendEscaped(out, character);
    shown += character.size();
  }
  out += '"';
  if (shown < text.size()) out.append("\n").append(aside(cutRemark(shown, text.size())));
  return out;
}

std::string TextView::shown(const Data& value) const {
  static constexpr std::string_view kHexDigits = "0123456789abcdef";
  const std::size_t shown = std::min(value.size(), kBytesShown);
  std::string out;
  for (std::size_t i = 0; i < shown; ++i) {
    if (i != 0 && i % kBytesInGroup == 0) out += '\n';
    out += kHexDigits[value.bytes()[i] >> 4U];
    out += kHexDigits[value.bytes()[i] & 0xFU];
  }
  if (shown != 0) out += '\n';
  return out += aside(shown < value.size() ? cutRemark(shown, value.size())
                                           : '(' + counted(shown, "byte") + ')');
}

std::string TextView::elements(std::size_t number) const {
  return aside(number == 0 ? "(empty list)" : '(' + counted(number, "element") + ')');
}

std::string TextView::aside(std::string_view remark) const {
  return std::string(style_.colours.aside).append(remark).append(style_.colours.end);
}

void TextView::label(std::string_view colour, std::string_view name, std::size_t indent) {
  out_.append(indent, ' ').append(colour).append(name).append(style_.colours.end);
}

void TextView::line(std::string_view value, std::size_t filled, std::size_t column) {
  out_.append(column - filled, ' ');
  appendWrapped(out_, value, column, column, style_.width);
  out_ += '\n';
}

}  // namespace ironmoat::inspect
