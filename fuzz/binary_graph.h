#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace ironmoat::fuzz {

/// One object of a binary property list, which may be malformed.
struct GraphObject {
  std::uint8_t marker = 0x08;  ///< kind in the high four bits
  std::string body;            ///< the bytes after marker and length, except in containers
  std::vector<std::uint64_t> references;  ///< of containers
  std::optional<std::uint64_t> length;    ///< to write; absent: the true one
  std::size_t lengthBytes = 0;            ///< 0: as few as possible
  std::optional<std::size_t> sameAs;      ///< object that it shares bytes with

  [[nodiscard]] unsigned kind() const { return marker >> 4U; }
  [[nodiscard]] bool isContainer() const { return kind() == 0xA || kind() == 0xC || kind() == 0xD; }
  [[nodiscard]] bool hasLength() const { return (kind() >= 0x4 && kind() <= 0x6) || isContainer(); }
};

/// A binary property list as a graph of objects that can be edited and written again. Parts that
/// are not edited stay consistent.
struct BinaryGraph {
  std::vector<GraphObject> objects;
  std::size_t offsetSize = 1;
  std::size_t referenceSize = 1;
  std::uint64_t root = 0;
  // False values to write into the trailer and the offset table.
  std::optional<std::uint64_t> count;
  std::optional<std::uint64_t> table;
  std::optional<std::uint8_t> saidOffsetSize;
  std::optional<std::uint8_t> saidReferenceSize;
  std::optional<std::pair<std::size_t, std::uint64_t>> offset;  ///< {object, offset}

  /// Accepts any bytes, and keeps as many objects as it can read.
  static BinaryGraph parse(std::string_view bytes);
  [[nodiscard]] std::string write() const;
};

}  // namespace ironmoat::fuzz
