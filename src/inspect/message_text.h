#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "inspect/code_points.h"
#include "inspect/place.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

inline bool isLineEnd(char32_t value) noexcept { return value == '\n' || value == '\r'; }

/// The characters of a message in UTF-8 or, if it begins with that byte-order mark, UTF-16; any
/// bytes will do. The message must outlive it.
class MessageText {
 public:
  explicit MessageText(const Data& message);

  /// The character at an offset below the message's size.
  [[nodiscard]] CodePoint at(std::size_t offset) const;
  /// The bytes of the character `point`, which is the one at `offset`, in UTF-8; in `buffer` where
  /// the message has others.
  [[nodiscard]] std::string_view utf8(std::size_t offset, const CodePoint& point,
                                      std::string& buffer) const;
  /// Linear in `offset`, which is at most the message's size.
  [[nodiscard]] TextPlace placeOf(std::size_t offset) const;
  /// Where the line of `offset` starts, or if that is more than `most` characters before it, some
  /// character about so far, which sets `cut`.
  [[nodiscard]] std::size_t startNear(std::size_t offset, std::size_t most, bool& cut) const;

 private:
  [[nodiscard]] char32_t unit(std::size_t offset) const;

  std::string_view bytes_;
  std::size_t unitSize_ = 1;
  std::size_t start_ = 0;  // behind the byte-order mark
  bool bigEndian_ = false;
};

}  // namespace ironmoat::inspect
