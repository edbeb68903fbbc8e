#pragma once

#include <cstddef>

#include "ironmoat/block.h"

namespace ironmoat::detail {

class RecordArena;

/// The source of `allocateArray` on this thread; null: malloc.
inline constinit thread_local RecordArena* currentArena = nullptr;

/// Memory for the arrays of one message's records: a few chunks instead of an allocation for each
/// array. For one thread; `sharing` says which threads may free the arrays.
class RecordArena {
 public:
  explicit RecordArena(Sharing sharing) noexcept : sharing_(sharing) {}
  RecordArena(const RecordArena&) = delete;
  RecordArena& operator=(const RecordArena&) = delete;

  /// Makes an arena the source of `allocateArray` on this thread while it exists. Scopes must not
  /// nest, and only code that allocates arrays of records of the arena's message may run in one.
  class Scope {
   public:
    explicit Scope(RecordArena& arena) noexcept { currentArena = &arena; }
    Scope(const Scope&) = delete;
    Scope& operator=(const Scope&) = delete;
    ~Scope() { currentArena = nullptr; }
  };

 private:
  friend void* allocateArray(std::size_t bytes);

  /// Whether an array of `bytes` lies in a chunk. The first one, which in most messages is the only
  /// one, has memory of its own, and large ones do.
  bool shares(std::size_t bytes) noexcept;
  /// Memory of `bytes` in a chunk, which the caller retains. Each chunk is twice as large as the
  /// one before.
  char* take(std::size_t bytes);

  BlockRef chunk_;
  std::size_t used_ = 0;  // of `capacity_` bytes in the chunk
  std::size_t capacity_ = 0;
  Sharing sharing_;
};

}  // namespace ironmoat::detail
