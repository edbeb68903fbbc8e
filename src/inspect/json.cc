#include "inspect/json.h"

#include <algorithm>

#include "inspect/terminal_text.h"

namespace ironmoat::inspect {

// Appends a comma, unless the value or name is the first in its brackets or follows a name.
void JsonWriter::separate() {
  static constexpr std::string_view kNoComma = "{[ \n";
  if (!out_.empty() && kNoComma.find(out_.back()) == kNoComma.npos) out_ += ", ";
}

void JsonWriter::integer(std::string_view digits) {
  if (integers_ == Integers::strings) return text(digits);
  separate();
  out_ += digits;
}

void JsonWriter::text(std::string_view text) {
  separate();
  out_ += '"';
  while (!text.empty()) {
    const CodePoint point = firstCodePoint(text);
    if (!point.wellFormed) {
      out_ += "\xEF\xBF\xBD";
    } else if (point.value == '"' || point.value == '\\') {
      out_.append(1, '\\').append(text, 0, 1);
    } else if (point.value == '\n' || point.value == '\t' || point.value == '\r') {
      out_ += point.value == '\n' ? "\\n" : point.value == '\t' ? "\\t" : "\\r";
    } else if (isControl(point.value)) {
      out_ += formatted("\\u%04x", static_cast<unsigned>(point.value));
    } else {
      out_ += text.substr(0, point.length);
    }
    text.remove_prefix(point.length);
  }
  out_ += '"';
}

void JsonWriter::bytes(std::span<const std::uint8_t> bytes) {
  static constexpr std::string_view kDigits =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  separate();
  out_ += '"';
  for (; !bytes.empty(); bytes = bytes.subspan(std::min<std::size_t>(3, bytes.size()))) {
    std::uint32_t group = 0;
    for (std::size_t i = 0; i < 3; ++i) group = group << 8U | (i < bytes.size() ? bytes[i] : 0U);
    for (std::size_t i = 0; i < 4; ++i) {
      out_ += i <= bytes.size() ? kDigits[group >> (18 - 6 * i) & 63U] : '=';
    }
  }
  out_ += '"';
}

}  // namespace ironmoat::inspect
