#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "inspect/terminal_text.h"
#include "ironmoat/values.h"

/// Where in a message an error is. The service has told the offset; this code counts lines and
/// shows bytes, and never interprets them.
namespace ironmoat::inspect {

/// Both from 1; columns in characters. A line ends with LF, CR LF or CR.
struct TextPosition {
  std::size_t line;
  std::size_t column;
};

/// Nothing for a binary message or an offset beyond the message's end, which is an offset, too.
std::optional<TextPosition> positionInText(const Data& message, std::uint64_t offset);

/// Appends a line that names the position, then the bytes around it and a mark below, unless there
/// are none; nothing for an offset beyond the message's end. All lines are indented by `indent`.
void appendPosition(std::string& out, const Data& message, std::uint64_t offset, const Style& style,
                    std::size_t indent);

}  // namespace ironmoat::inspect
