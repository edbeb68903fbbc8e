#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <utility>

#include "ironmoat/tsan.h"

namespace ironmoat {

namespace detail {
class RecordArena;
}

/// From which threads a block's references may be taken and given back.
///
/// `oneThread` blocks count without atomic operations: the service marks the blocks of one request
/// so, because a message, its records and its reply live and die inside one call on one thread.
/// Everything handed to a daemon is `anyThread`.
enum class Sharing : std::uint8_t { anyThread, oneThread };

/// Bytes with a reference count in front. Those behind every String and Data are written once by
/// BlockBuilder, then only read; at most 4 GiB - 1. Others are chunks of a RecordArena.
class Block {
 public:
  Block(const Block&) = delete;
  Block& operator=(const Block&) = delete;

  [[nodiscard]] const char* bytes() const noexcept {
    return reinterpret_cast<const char*>(this + 1);
  }
  [[nodiscard]] std::uint32_t size() const noexcept { return size_; }
  [[nodiscard]] Sharing sharing() const noexcept { return sharing_; }

  void retain(std::uint64_t count = 1) noexcept {
    if (sharing_ == Sharing::oneThread) {
      references_.store(references_.load(std::memory_order_relaxed) + count,
                        std::memory_order_relaxed);
    } else {
      references_.fetch_add(count, std::memory_order_relaxed);
    }
  }

  void release(std::uint64_t count = 1) noexcept {
    if (sharing_ == Sharing::oneThread) {
      const std::uint64_t left = references_.load(std::memory_order_relaxed) - count;
      references_.store(left, std::memory_order_relaxed);
      if (left == 0) std::free(this);
      return;
    }
    detail::announceRelease(references_);
    if (references_.fetch_sub(count, std::memory_order_acq_rel) != count) return;
    detail::announceAcquire(references_);
    std::free(this);
  }

 private:
  friend class BlockBuilder;
  friend class detail::RecordArena;
  explicit Block(Sharing sharing) noexcept : sharing_(sharing) {}

  std::atomic<std::uint64_t> references_{1};  // 64 bits: no sender can make it wrap
  std::uint32_t size_ = 0;
  Sharing sharing_;
};

/// An owning reference to a Block, or none.
class BlockRef {
 public:
  BlockRef() noexcept = default;
  /// Takes over a reference that the caller holds.
  static BlockRef adopt(Block* block) noexcept { return BlockRef(block); }
  BlockRef(const BlockRef& other) noexcept : block_(other.block_) {
    if (block_ != nullptr) block_->retain();
  }
  BlockRef(BlockRef&& other) noexcept : block_(std::exchange(other.block_, nullptr)) {}
  BlockRef& operator=(BlockRef other) noexcept {
    std::swap(block_, other.block_);
    return *this;
  }
  ~BlockRef() {
    if (block_ != nullptr) block_->release();
  }

  [[nodiscard]] Block* get() const noexcept { return block_; }
  [[nodiscard]] Block* operator->() const noexcept { return block_; }
  explicit operator bool() const noexcept { return block_ != nullptr; }

 private:
  explicit BlockRef(Block* block) noexcept : block_(block) {}
  Block* block_ = nullptr;
};

}  // namespace ironmoat
