#include "inspect/place.h"

#include <algorithm>
#include <deque>

#include "inspect/message_text.h"

namespace ironmoat::inspect {

namespace {

constexpr std::string_view kHexDigits = "0123456789abcdef";
constexpr std::string_view kCut = "...";

bool isBlank(char32_t value) { return value == ' ' || value == '\t'; }

bool isBinary(const Data& message) { return message.view().starts_with("bplist"); }

/// Lines below the one that says where: indented by two more than it.
std::size_t roomFor(const Style& style, std::size_t indent) {
  constexpr std::size_t kWidest = 100;
  constexpr std::size_t kNarrowest = 20;
  constexpr std::size_t kUsual = 80;
  const std::size_t width = std::min(style.width == 0 ? kUsual : style.width, kWidest);
  return std::max(kNarrowest, width - std::min(width, indent + 3));
}

void appendMarked(std::string& out, std::string_view line, std::size_t before, std::size_t marks,
                  const Style& style, std::size_t indent) {
  if (line.empty()) return;
  out.append(indent + 2, ' ').append(line).append("\n");
  out.append(indent + 2 + before, ' ').append(style.colours.error).append(marks, '^');
  out.append(style.colours.end).append("\n");
}

/// A character as it is shown, and the columns that it takes.
struct Cell {
  std::string shown;
  std::size_t columns = 0;
};

Cell cellOf(const CodePoint& point, std::string_view bytes) {
  if (point.value == '\t') return {" ", 1};
  Cell cell;
  cell.columns = appendHarmless(cell.shown, bytes, point);
  return cell;
}

/// Some of a line, a cell for each character.
class Cells {
 public:
  explicit Cells(const MessageText& text) : text_(text) {}

  /// Appends the character at `at`, and moves on behind it.
  void take(std::size_t& at) {
    const CodePoint point = text_.at(at);
    std::string buffer;
    cells_.push_back(cellOf(point, text_.utf8(at, point, buffer)));
    columns_ += cells_.back().columns;
    at += point.length;
  }
  void dropFirst() {
    columns_ -= cells_.front().columns;
    cells_.pop_front();
  }
  void dropLast() {
    columns_ -= cells_.back().columns;
    cells_.pop_back();
  }
  [[nodiscard]] std::size_t size() const { return cells_.size(); }
  [[nodiscard]] std::size_t columns() const { return columns_; }
  [[nodiscard]] std::string shown() const {
    std::string all;
    for (const Cell& cell : cells_) all += cell.shown;
    return all;
  }

 private:
  const MessageText& text_;
  std::deque<Cell> cells_;
  std::size_t columns_ = 0;
};

/// The line around `offset`, from its first visible character on, cut to what there is room for.
void appendText(std::string& out, const Data& message, std::size_t offset, const Style& style,
                std::size_t indent) {
  const MessageText text(message);
  const std::size_t room = roomFor(style, indent);
  const auto goesOn = [&](std::size_t at) {
    return at < message.size() && !isLineEnd(text.at(at).value);
  };
  bool cut = false;
  std::size_t at = text.startNear(offset, room, cut);
  while (!cut && at < offset && isBlank(text.at(at).value)) at += text.at(at).length;
  Cells before(text);
  while (at < offset) before.take(at);
  for (; before.columns() > room / 2; cut = true) before.dropFirst();

  Cells after(text);
  while (after.size() < room && goesOn(at)) after.take(at);
  const std::string front = std::string(cut ? kCut : "") + before.shown();
  const std::size_t mark = before.columns() + (cut ? kCut.size() : 0);
  bool cutAfter = goesOn(at);
  while (mark + after.columns() + (cutAfter ? kCut.size() : 0) > room) {
    after.dropLast();
    cutAfter = true;
  }
  appendMarked(out, front + after.shown() + std::string(cutAfter ? kCut : ""), mark, 1, style,
               indent);
}

/// Some bytes from before `offset` on, in hexadecimal and, where there is room, as ASCII.
void appendBytes(std::string& out, std::span<const std::uint8_t> bytes, std::size_t offset,
                 const Style& style, std::size_t indent) {
  constexpr std::size_t kMost = 16;
  constexpr std::size_t kColumns = 4;  // of a byte, with its ASCII
  const bool ascii = roomFor(style, indent) >= kMost * kColumns + 4;
  const std::size_t most = ascii ? kMost : std::min(kMost, roomFor(style, indent) / 3);
  const std::size_t start = offset - std::min(offset, most / 2);
  const auto shown = bytes.subspan(start, std::min(most, bytes.size() - start));
  std::string line;
  for (const std::uint8_t byte : shown) {
    if (!line.empty()) line += ' ';
    line += kHexDigits[byte >> 4U];
    line += kHexDigits[byte & 0xFU];
  }
  if (ascii) {
    line += "  |";
    for (const std::uint8_t byte : shown) line += byte >= ' ' && byte <= '~' ? char(byte) : '.';
    line += '|';
  }
  appendMarked(out, line, 3 * (offset - start), 2, style, indent);
}

}  // namespace

std::optional<TextPlace> placeInText(const Data& message, std::uint64_t offset) {
  if (isBinary(message) || offset > message.size()) return std::nullopt;
  return MessageText(message).placeOf(static_cast<std::size_t>(offset));
}

void appendPlace(std::string& out, const Data& message, std::uint64_t offset, const Style& style,
                 std::size_t indent) {
  if (offset > message.size()) return;
  const auto at = static_cast<std::size_t>(offset);
  const std::string_view end = at == message.size() ? ", the end\n" : "\n";
  out.append(indent, ' ');
  if (const auto place = placeInText(message, offset)) {
    out.append("line ").append(std::to_string(place->line));
    out.append(", column ").append(std::to_string(place->column)).append(end);
    appendText(out, message, at, style, indent);
  } else {
    out.append("byte ").append(std::to_string(offset));
    out.append(" of ").append(std::to_string(message.size())).append(end);
    appendBytes(out, message.bytes(), at, style, indent);
  }
}

}  // namespace ironmoat::inspect
