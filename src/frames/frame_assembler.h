#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>

#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::frames {

/// Splits received bytes into frame bodies: the caller reads into `room()`, reports the count to
/// `commit`, then calls `next` until it returns none. Large frames are read in place. Memory grows
/// with the bytes received, not with the length announced. Not thread-safe.
///
/// Invariants: while a large frame is incomplete, `remaining_` is not 0 and the buffer is empty.
/// `large_` is empty unless a large frame is incomplete, or complete and not yet taken.
class FrameAssembler {
 public:
  FrameAssembler(std::size_t maxBody, Sharing sharing);

  /// Where to read to next; never empty after `next` returned none. Valid until the next call.
  [[nodiscard]] std::span<char> room();
  /// The first `count` bytes of `room()` are received.
  void commit(std::size_t count);

  /// The next whole body, in a block of its own. Throws FrameError if the next frame announces more
  /// than `maxBody` bytes; the connection is then of no more use.
  [[nodiscard]] std::optional<Data> next();

  /// Whether a part of a frame is received and the rest is not.
  [[nodiscard]] bool midFrame() const noexcept { return remaining_ != 0 || first_ != last_; }

  /// Overwrites all of the buffer but the bytes that `next` has not returned yet.
  void wipeSpare() noexcept;

 private:
  [[nodiscard]] Data takeLarge();

  const std::size_t maxBody_;
  const Sharing sharing_;
  std::unique_ptr<char[]> buffer_;  // received and not yet part of a body: [first_, last_)
  std::size_t first_ = 0;
  std::size_t last_ = 0;
  BlockBuilder large_;         // body of a frame that exceeds the buffer, as far as received
  std::size_t remaining_ = 0;  // bytes that `large_` lacks
};

}  // namespace ironmoat::frames
