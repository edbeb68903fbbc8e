#include "values/block_builder.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <new>
#include <stdexcept>

namespace ironmoat {

namespace {
constexpr std::size_t kMaxSize = std::numeric_limits<std::uint32_t>::max();
constexpr std::size_t kFirstCapacity = 240;  // with the header, a 256-byte allocation
}  // namespace

BlockBuilder::~BlockBuilder() {
  if (block_ != nullptr) block_->release();
}

void BlockBuilder::growBy(std::size_t count) {
  if (count > kMaxSize - size_)
    throw std::length_error("block size exceeds the limit of 4294967295 bytes");
  const std::size_t wanted =
      std::min(std::max({size_ + count, capacity_ * 2, kFirstCapacity}), kMaxSize);
  // Nobody else can hold a reference before finish(), so moving the block is safe.
  void* memory = std::realloc(static_cast<void*>(block_), sizeof(Block) + wanted);
  if (memory == nullptr) throw std::bad_alloc();
  block_ = block_ == nullptr ? new (memory) Block(sharing_) : static_cast<Block*>(memory);
  capacity_ = wanted;
}

void BlockBuilder::append(std::string_view text) {
  if (!text.empty()) std::memcpy(extend(text.size()), text.data(), text.size());
}

BlockRef BlockBuilder::finish() noexcept {
  if (block_ == nullptr) return {};
  block_->size_ = static_cast<std::uint32_t>(size_);
  size_ = capacity_ = 0;
  return BlockRef::adopt(std::exchange(block_, nullptr));
}

}  // namespace ironmoat
