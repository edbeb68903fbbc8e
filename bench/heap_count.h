#pragma once

#include <cstddef>

namespace ironmoat::bench {

/// Counts of this process's heap. Linking heap_count.cc replaces malloc and its relatives. One
/// thread only.
struct HeapCount {
  std::size_t allocations = 0;  ///< calls of malloc, calloc, realloc and aligned ones
  std::size_t bytes = 0;        ///< allocated now
  std::size_t peak = 0;         ///< largest `bytes` since `restartPeak`
};

HeapCount heapCount() noexcept;
void restartPeak() noexcept;

}  // namespace ironmoat::bench
