#include "heap_count.h"

#include <malloc.h>

#include <algorithm>
#include <cerrno>

namespace {

ironmoat::bench::HeapCount count;

void* added(void* block) noexcept {
  if (block == nullptr) return nullptr;
  ++count.allocations;
  count.bytes += malloc_usable_size(block);
  count.peak = std::max(count.peak, count.bytes);
  return block;
}

void removing(void* block) noexcept {
  if (block != nullptr) count.bytes -= malloc_usable_size(block);
}

}  // namespace

// glibc's own allocator, under the names that it exports for replacements such as this one.
extern "C" {
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);
void* __libc_memalign(std::size_t alignment, std::size_t size);
void __libc_free(void* block);

void* malloc(std::size_t size) { return added(__libc_malloc(size)); }
void* calloc(std::size_t number, std::size_t size) { return added(__libc_calloc(number, size)); }
void* realloc(void* block, std::size_t size) {
  const std::size_t before = block == nullptr ? 0 : malloc_usable_size(block);
  void* now = __libc_realloc(block, size);
  if (now == nullptr) return nullptr;
  count.bytes -= before;
  return added(now);
}
void* memalign(std::size_t alignment, std::size_t size) {
  return added(__libc_memalign(alignment, size));
}
void* aligned_alloc(std::size_t alignment, std::size_t size) { return memalign(alignment, size); }
int posix_memalign(void** block, std::size_t alignment, std::size_t size) {
  *block = memalign(alignment, size);
  return *block == nullptr ? ENOMEM : 0;
}
void free(void* block) {
  removing(block);
  __libc_free(block);
}
}

namespace ironmoat::bench {

HeapCount heapCount() noexcept { return count; }
void restartPeak() noexcept { count.peak = count.bytes; }

}  // namespace ironmoat::bench
