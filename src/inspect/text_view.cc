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

void appendEscaped(std::string& out, std::string_view written, const CodePoint& point) {
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
  } else {
    out += "\\u{";
    appendHex(out, point.value);
    out += '}';
  }
}

std::string counted(std::size_t number, std::string_view unit) {
  std::string text = std::to_string(number) + ' ' + std::string(unit);
  if (number != 1) text += 's';
  return text;
}

}  // namespace

std::size_t appendHarmless(std::string& out, std::string_view text, const CodePoint& point) {
  const std::string_view written = text.substr(0, point.length);
  if (point.wellFormed && !isInvisible(point.value)) {
    out += written;
    return columnsOf(point.value);
  }
  const std::size_t before = out.size();
  appendEscaped(out, written, point);
  return out.size() - before;
}

void appendHarmless(std::string& out, std::string_view text) {
  while (!text.empty()) {
    const CodePoint point = firstCodePoint(text);
    appendHarmless(out, text, point);
    text.remove_prefix(point.length);
  }
}

std::string inQuotes(std::string_view text) {
  std::string out = "'";
  appendHarmless(out, text);
  return out += '\'';
}

void TextView::label(std::string_view name, std::size_t indent) {
  out_.append(indent, ' ');
  out_ += colours_.label;
  out_ += name;
  out_ += colours_.end;
}

void TextView::position(std::size_t index, std::size_t indent) {
  const std::string text = '[' + std::to_string(index) + ']';
  out_.append(indent, ' ');
  aside(text);
  column_ = valueColumn_ = indent + text.size();
}

/// Counts the columns that are written next, behind a space if `spaced` and something is in front
/// of them; on a new line if they do not fit on this one.
void TextView::makeRoom(std::size_t columns, bool spaced) {
  const std::size_t gap = spaced && column_ != valueColumn_ ? 1 : 0;
  if (width_ != 0 && column_ != valueColumn_ && column_ + gap + columns > width_) {
    out_ += '\n';
    out_.append(valueColumn_, ' ');
    column_ = valueColumn_;
  } else {
    out_.append(gap, ' ');
    column_ += gap;
  }
  column_ += columns;
}

// Quoted, with quotes and backslashes inside escaped, so that no text can pass for the view's own.
void TextView::text(std::string_view text) {
  const std::size_t size = text.size();
  out_ += '"';
  ++column_;
  std::size_t shown = 0;
  std::string character;
  while (shown < size && shown < kTextShown) {
    const CodePoint point = firstCodePoint(text.substr(shown));
    character.clear();
    const bool escaped = point.value == '"' || point.value == '\\';
    if (escaped) character += '\\';
    makeRoom(appendHarmless(character, text.substr(shown), point) + (escaped ? 1 : 0));
    out_ += character;
    shown += point.length;
  }
  makeRoom(1);
  out_ += '"';
  if (shown < size) {
    remark("... the first " + std::to_string(shown) + " of " + counted(size, "byte"));
  }
  out_ += '\n';
}

void TextView::bytes(std::span<const std::uint8_t> bytes) {
  const std::size_t shown = std::min(bytes.size(), kBytesShown);
  for (std::size_t i = 0; i < shown; ++i) {
    if (i % kBytesInGroup == 0) makeRoom(2 * std::min(kBytesInGroup, shown - i), true);
    out_ += kHexDigits[bytes[i] >> 4U];
    out_ += kHexDigits[bytes[i] & 0xFU];
  }
  if (shown < bytes.size()) {
    remark("... the first " + std::to_string(shown) + " of " + counted(bytes.size(), "byte"));
  } else {
    remark('(' + counted(shown, "byte") + ')');
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

void TextView::remark(std::string_view words) {
  makeRoom(words.size(), true);
  aside(words);
}

void TextView::aside(std::string_view remark) {
  out_ += colours_.aside;
  out_ += remark;
  out_ += colours_.end;
}

}  // namespace ironmoat::inspect
