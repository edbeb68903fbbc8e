#include "ironmoat/sparse_values.h"

#include <algorithm>
#include <utility>

namespace ironmoat::detail {

namespace {

void releaseBlockOf(const Cell& cell) noexcept {
  if (Block* const block = cell.block(); block != nullptr) block->release();
}

}  // namespace

void SparseValues::growTo(std::size_t count) {
  Cell* const cells = static_cast<Cell*>(allocateArray(count * sizeof(Cell)));
  if (cells_ != nullptr) {
    std::copy(cells_, cells_ + size_, cells);
    freeArray(cells_);
  }
  cells_ = cells;
  capacity_ = static_cast<std::uint8_t>(count);
}

void SparseValues::set(std::size_t field, Cell cell) {
  const std::size_t place = placeOf(field);
  if (has(field)) {
    releaseBlockOf(std::exchange(cells_[place], cell));
    return;
  }
  if (size_ == capacity_) {
    try {
      growTo(std::clamp<std::size_t>(std::size_t{2} * capacity_, 8, kMostFields));
    } catch (...) {
      releaseBlockOf(cell);
      throw;
    }
  }
  std::copy_backward(cells_ + place, cells_ + size_, cells_ + size_ + 1);
  cells_[place] = cell;
  mark(field);
}

void SparseValues::erase(std::size_t field) noexcept {
  if (!has(field)) return;
  const std::size_t place = placeOf(field);
  releaseBlockOf(cells_[place]);
  std::copy(cells_ + place + 1, cells_ + size_, cells_ + place);
  present_[field / 64] &= ~(std::uint64_t{1} << (field % 64));
  for (std::size_t word = field / 64 + 1; word < before_.size(); ++word) --before_[word];
  --size_;
}

}  // namespace ironmoat::detail
