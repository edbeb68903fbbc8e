#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "inspect/terminal_text.h"
#include "ironmoat/values.h"

/// The position of an error in a message. The service reports an offset; this code counts lines and
/// shows bytes, and never parses them.
namespace ironmoat::inspect {

/// Line and column from 1; columns count characters. A line ends with LF, CR LF or CR.
struct TextPosition {
  std::size_t line;
  std::size_t column;
};

/// Returns nothing for a binary message, or if `offset` exceeds the message's size.
std::optional<TextPosition> positionInText(const Data& message, std::uint64_t offset);

/// Appends a line with the position, then one with the bytes around it and one with a mark below
/// them, if the message has bytes there. Appends nothing if `offset` exceeds the message's size.
/// Indents all lines by `indent`.
void appendPosition(std::string& out, const Data& message, std::uint64_t offset, const Style& style,
                    std::size_t indent);

}  // namespace ironmoat::inspect
