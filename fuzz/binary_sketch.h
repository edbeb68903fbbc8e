#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace ironmoat::fuzz {

/// One object of a binary property list. What it says of itself may be wrong.
struct Sketched {
  std::uint8_t marker = 0x08;  ///< the high four bits: the kind; the low: as it says
  std::string body;            ///< what follows marker and length, for all but containers
  std::vector<std::uint64_t> references;  ///< of containers
  std::optional<std::uint64_t> length;    ///< in units, instead of the true one
  std::size_t lengthBytes = 0;            ///< 0: as few as will do, in the marker if they fit
  std::optional<std::size_t> sameAs;      ///< begins where that object does, and writes nothing

  [[nodiscard]] unsigned kind() const { return marker >> 4U; }
  [[nodiscard]] bool isContainer() const { return kind() == 0xA || kind() == 0xC || kind() == 0xD; }
  [[nodiscard]] bool hasLength() const { return (kind() >= 0x4 && kind() <= 0x6) || isContainer(); }
};

/// A binary property list taken apart, so that it can be edited and put together again: what the
/// edit leaves alone stays consistent.
struct BinarySketch {
  std::vector<Sketched> objects;
  std::size_t offsetSize = 1;
  std::size_t referenceSize = 1;
  std::uint64_t root = 0;
  // What the trailer and the table say instead of the truth.
  std::optional<std::uint64_t> count;
  std::optional<std::uint64_t> table;
  std::optional<std::uint8_t> saidOffsetSize;
  std::optional<std::uint8_t> saidReferenceSize;
  std::optional<std::pair<std::size_t, std::uint64_t>> offset;  ///< of one object

  /// Takes apart whatever the bytes can be taken for; nothing is required of them.
  static BinarySketch parse(std::string_view bytes);
  [[nodiscard]] std::string write() const;
};

}  // namespace ironmoat::fuzz
