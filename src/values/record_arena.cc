#include "values/record_arena.h"

#include <algorithm>
#include <cstdlib>
#include <new>

#include "ironmoat/record_memory.h"

namespace ironmoat::detail {

namespace {

/// In front of each array.
struct alignas(std::max_align_t) Header {
  Block* chunk;  // holds a reference; null: the array has memory of its own
};

constexpr std::size_t kMaxChunk = std::size_t{32} << 10;

#ifdef IRONMOAT_SANITIZED
constexpr bool kSharesChunks = false;  // so that a sanitizer tells the arrays apart
#else
constexpr bool kSharesChunks = true;
#endif

void* allocate(std::size_t bytes) {
  void* const memory = std::malloc(bytes);
  if (memory == nullptr) throw std::bad_alloc();
  return memory;
}

}  // namespace

bool RecordArena::shares(std::size_t bytes) noexcept {
  if (capacity_ != 0) return bytes <= kMaxChunk / 2;
  used_ = capacity_ = std::min(bytes, kMaxChunk / 2);
  return false;
}

char* RecordArena::take(std::size_t bytes) {
  if (bytes > capacity_ - used_) {
    const std::size_t size = kSharesChunks ? std::clamp(2 * capacity_, bytes, kMaxChunk) : bytes;
    chunk_ = BlockRef::adopt(new (allocate(sizeof(Block) + size)) Block(sharing_));
    capacity_ = size;
    used_ = 0;
  }
  char* const place = reinterpret_cast<char*>(chunk_.get() + 1) + used_;
  used_ += bytes;
  return place;
}

void* allocateArray(std::size_t bytes) {
  static_assert(sizeof(Block) % alignof(Header) == 0);
  const std::size_t size = (sizeof(Header) + bytes + sizeof(Header) - 1) & ~(sizeof(Header) - 1);
  RecordArena* const arena = currentArena;
  if (arena == nullptr || !arena->shares(size)) {
    return new (allocate(size)) Header{nullptr} + 1;
  }
  char* const place = arena->take(size);
  arena->chunk_->retain();
  return new (place) Header{arena->chunk_.get()} + 1;
}

void freeArray(void* array) noexcept {
  Header* const header = static_cast<Header*>(array) - 1;
  if (header->chunk != nullptr) {
    header->chunk->release();
  } else {
    std::free(header);
  }
}

}  // namespace ironmoat::detail
