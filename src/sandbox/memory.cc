#include "sandbox/memory.h"

#include <malloc.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <new>
#include <utility>

#include "sandbox_parts/sandbox_parts.h"

namespace ironmoat::sandbox {

namespace {

// Bytes; the deepest message takes less than half, except under a sanitizer.
constexpr std::size_t kStack = std::size_t{2} << 20;

constexpr std::uintptr_t kPage = 4096;
constexpr int kTopPad = 128 << 10;  // bytes by which the heap grows at least
std::uintptr_t pageSize = kPage;
std::uintptr_t stackEnd = 0;  // lowest address known to belong to the stack

[[gnu::noinline]] void growStack() noexcept {
  volatile char below[kStack];
  below[0] = 0;
  stackEnd = reinterpret_cast<std::uintptr_t>(below);
}

[[gnu::noinline]] void overwriteStack() noexcept {
  volatile char below[3 * kPage];
  for (volatile char& byte : below) byte = 0;
}

/// Overwrites the stack just below the caller's frame and releases the pages below that, except
/// those with the frames of the releasing call.
[[gnu::noinline]] void wipeStack() noexcept {
  overwriteStack();
  volatile char here = 0;
  const std::uintptr_t first = (stackEnd + pageSize - 1) / pageSize * pageSize;
  const std::uintptr_t last =
      (reinterpret_cast<std::uintptr_t>(&here) - kPage) / pageSize * pageSize;
  if (stackEnd == 0 || first >= last) return;
  // NOLINTNEXTLINE(performance-no-int-to-ptr): the address of a page
  ::madvise(reinterpret_cast<void*>(first), last - first, MADV_DONTNEED);
}

/// The end of the heap. No system call.
[[maybe_unused]] const void* heapEnd() noexcept { return ::sbrk(0); }

struct Piece {
  Piece* next;
};

/// Takes free pieces of `size` bytes from malloc until the heap grows, overwrites them and prepends
/// them to the list `taken`.
[[maybe_unused]] Piece* overwritePieces(std::size_t size, Piece* taken) noexcept {
  for (;;) {
    const void* const end = heapEnd();
    void* const memory = std::malloc(size);
    if (memory == nullptr) return taken;
    if (heapEnd() != end) {
      std::free(memory);
      return taken;
    }
    ::explicit_bzero(memory, ::malloc_usable_size(memory));
    taken = new (memory) Piece{taken};
  }
}

}  // namespace

void prepareMemory() noexcept {
  // One heap, which grows and shrinks at its end, so that lists of megabytes are neither mapped
  // anew for each message nor copied as they grow. The idle service releases what malloc keeps.
  ::mallopt(M_MMAP_MAX, 0);
  ::mallopt(M_TRIM_THRESHOLD, 512 << 20);
  rlimit stack = {};
  if (::getrlimit(RLIMIT_STACK, &stack) == 0 && stack.rlim_cur < 2 * kStack) {
    stack.rlim_cur = std::min<rlim_t>(stack.rlim_max, 2 * kStack);
    ::setrlimit(RLIMIT_STACK, &stack);
  }
  pageSize = static_cast<std::uintptr_t>(::sysconf(_SC_PAGESIZE));
  growStack();
}

void releaseMemory() noexcept { ::malloc_trim(0); }

void wipeAndReleaseMemory() noexcept {
  // The kernel wipes whole free pages. Free memory in pages that are also in use is taken from
  // malloc piece by piece, from large to small.
  releaseMemory();
  if constexpr (!sandbox::kSanitizedBuild) {
    ::mallopt(M_TOP_PAD, 0);  // so that the heap hardly grows for a piece that does not fit
    Piece* taken = nullptr;
    for (std::size_t size = std::size_t{64} << 10; size > 1024; size /= 2) {
      taken = overwritePieces(size, taken);
    }
    for (std::size_t size = 1024; size >= sizeof(Piece); size -= 16) {
      taken = overwritePieces(size, taken);
    }
    while (taken != nullptr) std::free(std::exchange(taken, taken->next));
    ::mallopt(M_TOP_PAD, kTopPad);
    releaseMemory();
  }
  wipeStack();
}

}  // namespace ironmoat::sandbox
