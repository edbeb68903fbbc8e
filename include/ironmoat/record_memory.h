#pragma once

#include <cstddef>

#include "ironmoat/api.h"

namespace ironmoat::detail {

/// Allocates an array of a record. While the service unpacks a message, arrays lie behind one
/// another in chunks (values/record_arena.h); each array keeps its chunk, so that it may outlive
/// all others. Throws std::bad_alloc.
IRONMOAT_API void* allocateArray(std::size_t bytes);
/// Frees it, on any thread that may release the values in it. `array` must not be null.
IRONMOAT_API void freeArray(void* array) noexcept;

template <class T>
struct ListAllocator {
  using value_type = T;

  ListAllocator() noexcept = default;
  template <class U>
  ListAllocator(const ListAllocator<U>&) noexcept {}  // NOLINT(google-explicit-constructor)

  T* allocate(std::size_t count) { return static_cast<T*>(allocateArray(count * sizeof(T))); }
  void deallocate(T* array, std::size_t) noexcept { freeArray(array); }

  friend bool operator==(const ListAllocator&, const ListAllocator&) noexcept { return true; }
};

}  // namespace ironmoat::detail
