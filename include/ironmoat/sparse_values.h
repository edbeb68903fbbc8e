#pragma once

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <type_traits>
#include <utility>

#include "ironmoat/record_memory.h"
#include "ironmoat/values.h"

namespace ironmoat::detail {

static_assert(std::endian::native == std::endian::little);

/// One value in 16 bytes: a String or Data as it lies in memory, or a null block followed by a
/// number or truth value. So a cell is moved, copied and released without knowing its type.
class Cell {
 public:
  Cell() = default;
  /// Text or data of a block, whose reference the cell takes over, its offset in the lower half of
  /// `bits` and its length in the upper; or a number or truth value, without a block.
  Cell(Block* block, std::uint64_t bits) noexcept {
    std::memcpy(bytes_, &block, kHalf);
    std::memcpy(bytes_ + kHalf, &bits, kHalf);
  }

  template <class T>
  static Cell of(T value) noexcept {
    Cell cell(nullptr, 0);
    if constexpr (std::is_arithmetic_v<T>) {
      std::memcpy(cell.bytes_ + offsetOf<T>(), &value, sizeof value);
    } else {
      std::construct_at(&cell.as<T>(), std::move(value));
    }
    return cell;
  }
  /// Told from an absent slice by its offset.
  static Cell emptyText() noexcept { return {nullptr, 1}; }

  template <class T>
  [[nodiscard]] T& as() noexcept {
    return *reinterpret_cast<T*>(bytes_ + offsetOf<T>());
  }
  [[nodiscard]] Block* block() const noexcept {
    Block* block = nullptr;
    std::memcpy(&block, bytes_, kHalf);
    return block;
  }

 private:
  static constexpr std::size_t kHalf = 8;

  template <class T>
  static constexpr std::size_t offsetOf() {
    static_assert(std::is_arithmetic_v<T> || sizeof(T) == sizeof(Cell));
    return std::is_arithmetic_v<T> ? kHalf : 0;
  }

  alignas(kHalf) std::byte bytes_[2 * kHalf];  // NOLINT: written when a cell is appended
};

/// The fields of a sparse record that are present: a bit for each field, and the values of those
/// that are, in the order of the fields. Making, moving and destroying a record of 150 fields then
/// costs what is in it.
///
/// Invariant: `cells_` holds a cell for each bit of `present_`.
class SparseValues {
 public:
  static constexpr std::size_t kMostFields = 192;

  SparseValues() noexcept = default;
  SparseValues(const SparseValues& other) {
    reserve(other.size_);
    present_ = other.present_;
    before_ = other.before_;
    for (; size_ < other.size_; ++size_) {
      cells_[size_] = other.cells_[size_];
      if (Block* const block = cells_[size_].block(); block != nullptr) block->retain();
    }
  }
  SparseValues(SparseValues&& other) noexcept { swap(other); }
  SparseValues& operator=(SparseValues other) noexcept {
    swap(other);
    return *this;
  }
  ~SparseValues() {
    if (cells_ != nullptr) release();
  }

  [[nodiscard]] bool has(std::size_t field) const noexcept {
    return ((present_[field / 64] >> (field % 64)) & 1) != 0;
  }
  /// Requires has(field).
  [[nodiscard]] Cell& at(std::size_t field) const noexcept { return cells_[placeOf(field)]; }

  /// Makes room for so many values, all in all.
  void reserve(std::size_t count) {
    if (count > capacity_) growTo(count);
  }
  /// Appends a value; requires room for it, and that no field from this one on is present.
  void append(std::size_t field, Cell cell) noexcept {
    cells_[size_] = cell;
    mark(field);
  }
  /// Sets the value of a field; takes over the cell's reference even when it throws.
  IRONMOAT_API void set(std::size_t field, Cell cell);
  IRONMOAT_API void erase(std::size_t field) noexcept;

 private:
  [[nodiscard]] std::size_t placeOf(std::size_t field) const noexcept {
    const std::uint64_t below = (std::uint64_t{1} << (field % 64)) - 1;
    return before_[field / 64] +
           static_cast<std::size_t>(std::popcount(present_[field / 64] & below));
  }
  void mark(std::size_t field) noexcept {
    present_[field / 64] |= std::uint64_t{1} << (field % 64);
    for (std::size_t word = field / 64 + 1; word < before_.size(); ++word) ++before_[word];
    ++size_;
  }
  void swap(SparseValues& other) noexcept {
    std::swap(present_, other.present_);
    std::swap(cells_, other.cells_);
    std::swap(before_, other.before_);
    std::swap(size_, other.size_);
    std::swap(capacity_, other.capacity_);
  }
  /// Most values are of one block, whose references go back in one step.
  void release() noexcept {
    Block* const common = size_ == 0 ? nullptr : cells_[0].block();
    std::uint64_t ofCommon = 0;
    for (std::size_t i = 0; i < size_; ++i) {
      Block* const block = cells_[i].block();
      if (block == common) {
        ++ofCommon;
      } else if (block != nullptr) {
        block->release();
      }
    }
    if (common != nullptr) common->release(ofCommon);
    freeArray(cells_);
  }
  IRONMOAT_API void growTo(std::size_t count);

  std::array<std::uint64_t, kMostFields / 64> present_{};  // bit i % 64 of word i / 64
  Cell* cells_ = nullptr;
  std::array<std::uint8_t, kMostFields / 64> before_{};  // values in the words before
  std::uint8_t size_ = 0;
  std::uint8_t capacity_ = 0;
};

}  // namespace ironmoat::detail
