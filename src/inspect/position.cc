#include "inspect/position.h"

#include <algorithm>

#include "values/utf8.h"

namespace ironmoat::inspect {

namespace {

const std::string kCut = "...";

bool isContinuation(char c) { return (c & 0xC0) == 0x80; }
bool isLineEnd(char c) { return c == '\n' || c == '\r'; }

/// A message as UTF-8, without its byte-order mark. Bytes may be invalid.
struct Text {
  std::string converted;  // from UTF-16, up to some characters after `mark`
  std::string_view utf8;
  std::size_t mark = 0;       // the offset in `utf8`
  std::size_t lineStart = 0;  // start of the line of `mark`
  TextPosition position{1, 1};

  Text(const Data& message, std::size_t offset) : utf8(message.view()), mark(offset) {
    if (utf8.starts_with("\xFE\xFF") || utf8.starts_with("\xFF\xFE")) {
      convert(offset);
    } else if (utf8.starts_with("\xEF\xBB\xBF")) {
      utf8.remove_prefix(3);
      mark -= std::min<std::size_t>(mark, 3);
    }
    for (std::size_t i = 0; i < mark; ++i) {
      if (!isLineEnd(utf8[i]) || utf8.substr(i, 2) == "\r\n") continue;
      ++position.line;
      lineStart = i + 1;
    }
    for (const char c : utf8.substr(lineStart, mark - lineStart)) {
      if (!isContinuation(c)) ++position.column;
    }
  }

 private:
  void convert(std::size_t offset) {
    constexpr std::size_t kBytesBehindMark = 1000;
    const std::string_view utf16 = utf8.substr(0, std::min(utf8.size(), offset + kBytesBehindMark));
    const std::size_t high = utf16.front() == '\xFE' ? 0 : 1;
    const auto unit = [&](std::size_t i) -> char32_t {
      if (i + 2 > utf16.size()) return kReplacement;
      return char32_t{static_cast<unsigned char>(utf16[i + high])} << 8U |
             static_cast<unsigned char>(utf16[i + 1 - high]);
    };
    mark = utf8.npos;
    for (std::size_t i = 2; i < utf16.size(); i += 2) {
      if (i >= offset) mark = std::min(mark, converted.size());
      char32_t value = unit(i);
      if (value >= 0xD800 && value < 0xDC00 && (unit(i + 2) & 0xFC00U) == 0xDC00) {
        value = 0x10000 + ((value & 0x3FFU) << 10U) + (unit(i += 2) & 0x3FFU);
      } else if ((value & 0xF800U) == 0xD800) {
        value = kReplacement;
      }
      char bytes[4];
      converted.append(bytes, writeUtf8(value, bytes));
    }
    utf8 = converted;
    mark = std::min(mark, converted.size());
  }
  static constexpr char32_t kReplacement = 0xFFFD;
};

/// Columns for the lines that show bytes. These are indented by two more than the position.
std::size_t roomFor(const Style& style, std::size_t indent) {
  constexpr std::size_t kUsual = 80;
  constexpr std::size_t kMin = 20;
  constexpr std::size_t kMax = 100;
  const std::size_t width = std::min(style.width == 0 ? kUsual : style.width, kMax);
  return std::max(kMin, width - std::min(width, indent + 3));
}

void appendMarked(std::string& out, std::string_view line, std::size_t before, std::size_t marks,
                  const Style& style, std::size_t indent) {
  out.append(indent + 2, ' ').append(line).append("\n");
  out.append(indent + 2 + before, ' ').append(style.colours.error).append(marks, '^');
  out.append(style.colours.end).append("\n");
}

std::string shown(std::string_view character) {
  std::string out;
  if (character == "\t") return " ";
  appendEscaped(out, character);
  return out;
}

/// Appends the line of the mark, without leading spaces, cut to the width of the screen.
void appendLine(std::string& out, const Text& text, const Style& style, std::size_t indent) {
  const std::size_t room = roomFor(style, indent);
  const std::size_t maxBytes = 4 * room;  // bound, because characters can take no columns
  std::size_t columns = 0;
  std::size_t start = text.mark;
  std::string line;
  while (start > text.lineStart && columns < room / 2 && text.mark - start < maxBytes) {
    std::size_t length = 1;
    while (length < 4 && start - length > text.lineStart &&
           isContinuation(text.utf8[start - length])) {
      ++length;
    }
    if (firstCodePoint(text.utf8.substr(start - length)).length != length) length = 1;
    start -= length;
    line.insert(0, shown(text.utf8.substr(start, length)));
    columns += columnsOf(shown(text.utf8.substr(start, length)));
  }
  if (start > text.lineStart) {
    line.insert(0, kCut);
  } else {
    line.erase(0, line.find_first_not_of(' '));
  }
  const std::size_t before = columns = columnsOf(line);
  std::size_t cutAt = line.size();  // end of the last character after which kCut fits
  for (std::size_t end = text.mark; end < text.utf8.size() && !isLineEnd(text.utf8[end]);) {
    const std::size_t length = firstCodePoint(text.utf8.substr(end)).length;
    const std::string character = shown(text.utf8.substr(end, length));
    columns += columnsOf(character);
    if (columns > room || end - text.mark >= maxBytes) {
      line.replace(cutAt, line.npos, kCut);
      break;
    }
    line += character;
    if (columns + kCut.size() <= room) cutAt = line.size();
    end += length;
  }
  if (!line.empty()) appendMarked(out, line, before, 1, style, indent);
}

/// Appends bytes around `offset` in hexadecimal and as ASCII.
void appendBytes(std::string& out, const Data& message, std::size_t offset, const Style& style,
                 std::size_t indent) {
  const std::size_t count = std::min<std::size_t>(16, (roomFor(style, indent) - 3) / 4);
  const std::size_t start = offset - std::min(offset, count / 2);
  std::string hex;
  std::string ascii;
  for (const std::uint8_t byte :
       message.bytes().subspan(start).first(std::min(count, message.size() - start))) {
    hex += formatted("%02x ", byte);
    ascii += byte >= ' ' && byte <= '~' ? static_cast<char>(byte) : '.';
  }
  appendMarked(out, hex + " |" + ascii + '|', 3 * (offset - start), 2, style, indent);
}

bool isBinary(const Data& message) { return message.view().starts_with("bplist"); }

}  // namespace

std::optional<TextPosition> positionInText(const Data& message, std::uint64_t offset) {
  if (isBinary(message) || offset > message.size()) return std::nullopt;
  return Text(message, static_cast<std::size_t>(offset)).position;
}

void appendPosition(std::string& out, const Data& message, std::uint64_t offset, const Style& style,
                    std::size_t indent) {
  if (offset > message.size()) return;
  const auto at = static_cast<std::size_t>(offset);
  const std::string_view end = at == message.size() ? ", the end\n" : "\n";
  out.append(indent, ' ');
  if (isBinary(message)) {
    out.append("byte ").append(std::to_string(offset));
    out.append(" of ").append(std::to_string(message.size())).append(end);
    appendBytes(out, message, at, style, indent);
  } else {
    const Text text(message, at);
    out.append("line ").append(std::to_string(text.position.line));
    out.append(", column ").append(std::to_string(text.position.column)).append(end);
    appendLine(out, text, style, indent);
  }
}

}  // namespace ironmoat::inspect
