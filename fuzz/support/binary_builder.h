#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "ironmoat/values.h"
#include "support/tight_message.h"

namespace ironmoat::testing {

/// `value` in `size` bytes, big-endian.
inline std::string bigEndianBytes(std::uint64_t value, std::size_t size) {
  std::string bytes(size, '\0');
  for (std::size_t i = size; i-- > 0; value >>= 8) bytes[i] = static_cast<char>(value);
  return bytes;
}

/// A binary property list put together object by object, so that each part of it can lie.
struct BinaryBuilder {
  std::vector<std::string> objects;
  std::size_t offsetSize = 2;
  std::size_t referenceSize = 1;
  std::uint64_t root = 0;
  std::optional<std::uint64_t> objectCount;
  std::optional<std::uint64_t> tableOffset;
  std::vector<std::uint64_t> offsets;  ///< instead of the true ones, when there are any

  BinaryBuilder& add(std::string object) {
    objects.push_back(std::move(object));
    return *this;
  }
  BinaryBuilder& ascii(std::string_view text) { return add(head(0x50, text.size()).append(text)); }
  BinaryBuilder& integer(std::uint8_t value) { return add({'\x10', static_cast<char>(value)}); }
  BinaryBuilder& array(const std::vector<std::uint64_t>& elements) {
    return add(head(0xA0, elements.size()) + references(elements));
  }
  BinaryBuilder& dictionary(const std::vector<std::uint64_t>& keys,
                            const std::vector<std::uint64_t>& values) {
    return add(head(0xD0, keys.size()) + references(keys) + references(values));
  }

  [[nodiscard]] std::string text() const {
    std::string out = "bplist00";
    std::vector<std::uint64_t> places;
    for (const std::string& object : objects) {
      places.push_back(out.size());
      out += object;
    }
    const std::size_t table = out.size();
    for (const std::uint64_t place : offsets.empty() ? places : offsets) {
      out += bigEndianBytes(place, offsetSize);
    }
    out.append(6, '\0');
    out += static_cast<char>(offsetSize);
    out += static_cast<char>(referenceSize);
    out +=
        bigEndianBytes(objectCount.value_or(offsets.empty() ? places.size() : offsets.size()), 8);
    out += bigEndianBytes(root, 8);
    out += bigEndianBytes(tableOffset.value_or(table), 8);
    return out;
  }
  [[nodiscard]] Data data() const { return tightMessage(text()); }

  static std::string head(unsigned marker, std::size_t count) {
    if (count < 15) return {static_cast<char>(marker | count)};
    std::string bytes = {static_cast<char>(marker | 15)};
    if (count < 0x100) return bytes + '\x10' + bigEndianBytes(count, 1);
    return bytes + '\x12' + bigEndianBytes(count, 4);
  }

 private:
  [[nodiscard]] std::string references(const std::vector<std::uint64_t>& objects) const {
    std::string bytes;
    for (const std::uint64_t object : objects) bytes += bigEndianBytes(object, referenceSize);
    return bytes;
  }
};

}  // namespace ironmoat::testing
