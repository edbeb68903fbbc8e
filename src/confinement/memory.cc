#include "confinement/memory.h"

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

#include "confinement_parts/confinement_parts.h"

namespace ironmoat::confinement {

namespace {

// A message of the deepest nesting takes under 1 MiB, several times that with a sanitizer.
constexpr std::size_t kStack = std::size_t{2} << 20;

constexpr std::uintptr_t kPage = 4096;
constexpr int kTopPad = 128 << 10;  // by which the heap grows at least
std::uintptr_t pageSize = kPage;
std::uintptr_t stackEnd = 0;  // the lowest address that belongs to the stack for certain

[[gnu::noinline]] void growStack() noexcept {
  volatile char below[kStack];
  below[0] = 0;
  stackEnd = reinterpret_cast<std::uintptr_t>(below);
}

[[gnu::noinline]] void overwriteStack() noexcept {
  volatile char below[3 * kPage];
  for (volatile char& byte : below) byte = 0;
}

/// Overwrites what lies just below the caller's frame and releases the pages below that, but for
/// the frames of the call that releases them.
[[gnu::noinline]] void wipeStack() noexcept {
  overwriteStack();
  volatile char here = 0;
  const std::uintptr_t first = (stackEnd + pageSize - 1) / pageSize * pageSize;
  const std::uintptr_t last =
      (reinterpret_cast<std::uintptr_t>(&here) - kPage) / pageSize * pageSize;
  if (stackEnd == 0 || first >= last) return;
  // NOLINTNEXTLINE(performance-no-int-to-ptr): a page by its number
  ::madvise(reinterpret_cast<void*>(first), last - first, MADV_DONTNEED);
}

/// Where the heap ends. No system call.
[[maybe_unused]] const void* heapEnd() noexcept { return ::sbrk(0); }

struct Piece {
  Piece* next;
};

/// Overwrites free pieces of `size` bytes and puts them before `taken`, until the heap would grow.
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
  // One heap that grows and shrinks at its end: lists of megabytes are then neither mapped and
  // faulted in anew for each message nor copied as they grow. What is kept is released when the
  // service has nothing to do.
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
  // Whole free pages go back to the kernel. What is free in pages that are also in use is taken
  // from malloc piece by piece, from large to small.
  releaseMemory();
  if constexpr (!confinement::kSanitizedBuild) {
    ::mallopt(M_TOP_PAD, 0);  // so that the heap hardly grows for what does not fit
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

}  // namespace ironmoat::confinement
