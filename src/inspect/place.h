#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "inspect/text_view.h"
#include "ironmoat/values.h"

/// A byte of a message, for people. Which one, the service has said; here bytes are counted and
/// shown, and not asked for what they mean.
namespace ironmoat::inspect {

/// Both from 1; columns in characters. A line ends with LF, CR LF or CR.
struct TextPlace {
  std::size_t line;
  std::size_t column;
};

/// Nothing for a message in binary form or an offset that is not in it. The message's length counts
/// as an offset: its end.
std::optional<TextPlace> placeInText(const Data& message, std::uint64_t offset);

/// Appends a line that says where the offset is, and two that show what stands there and around it,
/// if anything does, with a mark below; nothing for an offset that is not in the message.
void appendPlace(std::string& out, const Data& message, std::uint64_t offset, const Style& style,
                 std::size_t indent);

}  // namespace ironmoat::inspect
