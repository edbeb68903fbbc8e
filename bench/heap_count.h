#pragma once

#include <cstddef>

namespace ironmoat::bench {

/// What this process's heap has been asked for: linking heap_count.cc puts it in the place of
/// malloc and all that goes through it. For one thread.
struct HeapCount {
  std::size_t allocations =
      0;                  ///< malloc, calloc and aligned ones; a realloc that is its own block
  std::size_t bytes = 0;  ///< held now
  std::size_t peak = 0;   ///< the most that was held since `restartPeak`
};

HeapCount heapCount() noexcept;
void restartPeak() noexcept;

}  // namespace ironmoat::bench
