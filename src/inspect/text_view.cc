#include "inspect/text_view.h"

#include "inspect/code_points.h"

namespace ironmoat::inspect {

namespace {

constexpr std::string_view kHexDigits = "0123456789abcdef";
constexpr std::size_t kBytesShown = 32;
constexpr std::size_t kBytesInGroup = 4;
constexpr std::size_t kTextShown = 400;  // bytes of it

void appendHex(std::string& out, std::uint32_t value) {
  if (value >= 16) appendHex(out, value >> 4U);
  out += kHexDigits[value & 0xFU];
}

void appendHarmless(std::string& out, std::string_view text, const CodePoint& point) {
  const std::string_view written = text.substr(0, point.length);
  if (!point.wellFormed) {
    for (const char byte : written) {
      out += "\\x{";
      appendHex(out, static_cast<unsigned char>(byte));
      out += '}';
    }
  } else if (point.value == '\n') {
    out += "\\n";
  } else if (point.value == '\t') {
    out += "\\t";
  } else if (point.value == '\r') {
    out += "\\r";
  } else if (isInvisible(point.value)) {
    out += "\\u{";
    appendHex(out, point.value);
    out += '}';
  } else {
    out += written;
  }
}

std::string counted(std::size_t number, std::string_view unit) {
  std::string text = std::to_string(number) + ' ' + std::string(unit);
  if (number != 1) text += 's';
  return text;
}

}  // namespace

void appendHarmless(std::string& out, std::string_view text) {
  while (!text.empty()) {
    const CodePoint point = firstCodePoint(text);
    appendHarmless(out, text, point);
    text.remove_prefix(point.length);
  }
}

void TextView::label(std::string_view name, std::size_t indent) {
  out_.append(indent, ' ');
  out_ += colours_.label;
  out_ += name;
  out_ += colours_.end;
}

void TextView::position(std::size_t index, std::size_t indent) {
  out_.append(indent, ' ');
  aside('[' + std::to_string(index) + ']');
}

// Quoted, with quotes and backslashes inside escaped, so that no text can pass for the view's own.
void TextView::text(std::string_view text) {
  const std::size_t size = text.size();
  out_ += '"';
  std::size_t shown = 0;
  while (shown < size && shown < kTextShown) {
    const CodePoint point = firstCodePoint(text.substr(shown));
    if (point.value == '"' || point.value == '\\') out_ += '\\';
    appendHarmless(out_, text.substr(shown), point);
    shown += point.length;
  }
  out_ += '"';
  if (shown < size)
    aside(" ... the first " + std::to_string(shown) + " of " + counted(size, "byte"));
  out_ += '\n';
}

void TextView::bytes(std::span<const std::uint8_t> bytes) {
  const std::size_t shown = std::min(bytes.size(), kBytesShown);
  for (std::size_t i = 0; i < shown; ++i) {
    if (i != 0 && i % kBytesInGroup == 0) out_ += ' ';
    out_ += kHexDigits[bytes[i] >> 4U];
    out_ += kHexDigits[bytes[i] & 0xFU];
  }
  if (shown < bytes.size()) {
    aside(" ... the first " + std::to_string(shown) + " of " + counted(bytes.size(), "byte"));
  } else {
    aside((shown == 0 ? "(" : " (") + counted(shown, "byte") + ')');
  }
  out_ += '\n';
}

void TextView::count(std::size_t elements) {
  aside(elements == 0 ? "(empty list)" : '(' + counted(elements, "element") + ')');
  out_ += '\n';
}

void TextView::noFields(std::size_t indent) {
  out_.append(indent, ' ');
  aside("(no fields)");
  out_ += '\n';
}

void TextView::aside(std::string_view remark) {
  out_ += colours_.aside;
  out_ += remark;
  out_ += colours_.end;
}

}  // namespace ironmoat::inspect
