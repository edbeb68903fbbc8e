#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>

#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::frames {

/// Turns bytes as they arrive into frame bodies: read into `room()`, say how many with `commit`,
/// take bodies out with `next` until there is none. Large frames are read in place. Memory grows
/// with the bytes that came, not with the length that was announced. Not thread-safe.
class FrameAssembler {
 public:
  FrameAssembler(std::size_t maxBody, Sharing sharing);

  /// Where to read to next; never empty once `next` had nothing. Valid until the next call.
  [[nodiscard]] std::span<char> room();
  /// The first `count` bytes of `room()` have come.
  void commit(std::size_t count);

  /// The next whole body, in a block of its own. Throws FrameError when the next frame announces
  /// more than `maxBody`; the connection is then of no more use.
  [[nodiscard]] std::optional<Data> next();

  /// Part of a frame has come and the rest has not.
  [[nodiscard]] bool midFrame() const noexcept { return remaining_ != 0 || first_ != last_; }

  /// Overwrites the part of the buffer whose bytes `next` has already given out.
  void wipeSpare() noexcept;

 private:
  [[nodiscard]] Data takeLarge();

  const std::size_t maxBody_;
  const Sharing sharing_;
  std::unique_ptr<char[]> buffer_;  // what came and is not yet part of a body: [first_, last_)
  std::size_t first_ = 0;
  std::size_t last_ = 0;
  BlockBuilder large_;         // a frame that does not fit the buffer, as far as it came
  std::size_t remaining_ = 0;  // bytes that `large_` still lacks
  bool largeDone_ = false;
};

}  // namespace ironmoat::frames
