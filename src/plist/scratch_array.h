#pragma once

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <new>
#include <span>
#include <type_traits>

namespace ironmoat::plist {

/// A growable array of trivial values. The first `InlineCount` are stored in the object itself, so
/// that most messages are read without an allocation. Neither copyable nor movable.
template <class T, std::size_t InlineCount>
class ScratchArray {
  static_assert(std::is_trivially_copyable_v<T> && std::is_trivially_destructible_v<T>);

 public:
  ScratchArray() noexcept = default;
  ScratchArray(const ScratchArray&) = delete;
  ScratchArray& operator=(const ScratchArray&) = delete;
  ~ScratchArray() {
    if (items_ != inlined()) std::free(items_);
  }

  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] bool empty() const noexcept { return size_ == 0; }
  T& operator[](std::size_t i) noexcept { return items_[i]; }
  const T& operator[](std::size_t i) const noexcept { return items_[i]; }
  [[nodiscard]] T& back() noexcept { return items_[size_ - 1]; }
  [[nodiscard]] std::span<const T> span(std::size_t first, std::size_t count) const noexcept {
    return {items_ + first, count};
  }

  void push(const T& value) {
    if (size_ == capacity_) growTo(size_ + 1);
    items_[size_++] = value;
  }
  /// Appends `count` contiguous items, which the caller must write. The count must be bounded by
  /// the size of the message.
  T* extend(std::size_t count) {
    if (count > capacity_ - size_) growTo(size_ + count);
    T* place = items_ + size_;
    size_ += count;
    return place;
  }
  void shrinkTo(std::size_t size) noexcept { size_ = size; }

 private:
  T* inlined() noexcept { return reinterpret_cast<T*>(inline_); }

  void growTo(std::size_t wanted) {
    const std::size_t capacity = wanted > capacity_ * 2 ? wanted : capacity_ * 2;
    const bool wasInline = items_ == inlined();
    void* memory = std::realloc(wasInline ? nullptr : items_, capacity * sizeof(T));
    if (memory == nullptr) throw std::bad_alloc();
    if (wasInline) std::memcpy(memory, inline_, size_ * sizeof(T));
    items_ = static_cast<T*>(memory);
    capacity_ = capacity;
  }

  alignas(T) std::byte inline_[InlineCount * sizeof(T)];  // NOLINT: written before it is read
  T* items_ = inlined();
  std::size_t size_ = 0;
  std::size_t capacity_ = InlineCount;
};

}  // namespace ironmoat::plist
