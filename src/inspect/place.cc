#include "inspect/place.h"

#include <algorithm>
#include <vector>

#include "inspect/message_text.h"

namespace ironmoat::inspect {

namespace {

constexpr std::string_view kHexDigits = "0123456789abcdef";
constexpr std::string_view kCut = "...";

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

/// The line around `offset`, from its first visible character on, cut to what there is room for.
void appendText(std::string& out, const Data& message, std::size_t offset, const Style& style,
                std::size_t indent) {
  const MessageText text(message);
  const std::size_t room = roomFor(style, indent);
  const std::size_t roomBefore = room / 2;
  std::vector<Cell> cells;
  std::size_t before = 0;  // columns of the cells in front of the place
  std::size_t first = 0;   // of the cells that are shown
  bool cut = false;
  std::size_t at = text.startNear(offset, 2 * roomBefore, cut);
  const auto next = [&] {
    const CodePoint point = text.at(at);
    std::string buffer;
    cells.push_back(cellOf(point, text.utf8(at, point, buffer)));
    at += point.length;
  };
  while (at < offset) {
    const CodePoint point = text.at(at);
    if (cells.empty() && !cut && (point.value == ' ' || point.value == '\t')) {
      at += point.length;
      continue;
    }
    next();
    before += cells.back().columns;
  }
  for (; before > roomBefore; cut = true) before -= cells[first++].columns;
  std::size_t width = before;
  while (at < message.size() && !isLineEnd(text.at(at).value)) {
    const std::size_t here = at;
    next();
    width += cells.back().columns;
    if (width + 2 * kCut.size() > room) {
      cells.pop_back();
      at = here;
      break;
    }
  }
  std::string line(cut ? kCut : "");
  for (std::size_t i = first; i < cells.size(); ++i) line += cells[i].shown;
  if (at < message.size() && !isLineEnd(text.at(at).value)) line += kCut;
  appendMarked(out, line, before + (cut ? kCut.size() : 0), 1, style, indent);
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
