#pragma once

#include <cstddef>
#include <string_view>

#include "ironmoat/block.h"

namespace ironmoat {

/// Writes the bytes of one Block: append, then `finish`. Grows by doubling, so that the memory held
/// is bounded by the bytes appended, never by a count that a sender announced. Throws
/// std::bad_alloc, and std::length_error past 4 GiB - 1.
class BlockBuilder {
 public:
  explicit BlockBuilder(Sharing sharing = Sharing::anyThread) noexcept : sharing_(sharing) {}
  BlockBuilder(const BlockBuilder&) = delete;
  BlockBuilder& operator=(const BlockBuilder&) = delete;
  ~BlockBuilder();

  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] std::size_t capacity() const noexcept { return capacity_; }
  /// Null while there is no capacity; valid until the next call that grows.
  [[nodiscard]] char* bytes() noexcept {
    return block_ == nullptr ? nullptr : reinterpret_cast<char*>(block_ + 1);
  }

  /// Reserves memory for `count` more bytes.
  void reserve(std::size_t count) {
    if (count > capacity_ - size_) growBy(count);
  }
  /// Appends `count` bytes for the caller to write; the pointer is valid until the next append.
  char* extend(std::size_t count) {
    reserve(count);
    char* place = bytes() + size_;
    size_ += count;
    return place;
  }
  void append(std::string_view text);
  void push(char byte) { *extend(1) = byte; }
  /// Removes all but the first `size` bytes.
  void truncate(std::size_t size) noexcept { size_ = size < size_ ? size : size_; }

  /// The finished block, or null if nothing was ever appended. The builder is empty afterwards.
  BlockRef finish() noexcept;

 private:
  void growBy(std::size_t count);

  Block* block_ = nullptr;
  std::size_t size_ = 0;
  std::size_t capacity_ = 0;
  Sharing sharing_;
};

}  // namespace ironmoat
