#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <mutex>
#include <optional>
#include <vector>

#include "frames/frame_assembler.h"
#include "ironmoat/block.h"
#include "ironmoat/values.h"

namespace ironmoat::host {

/// Requests off a descriptor, one at a time to whichever thread asks.
class RequestSource {
 public:
  explicit RequestSource(int descriptor);

  /// The next request's frame body, in a block for the calling thread alone; nothing at the end of
  /// input (also in the middle of a frame), after `close`, and after a frame that could not be
  /// trusted, for which one caller gets the FrameError.
  std::optional<Data> next();
  void close();

 private:
  const int descriptor_;
  std::mutex mutex_;
  frames::FrameAssembler assembler_;
  bool ended_ = false;
};

/// Replies onto a descriptor, from any thread. A thread that finds another one writing leaves its
/// reply to it, so that replies finished together leave in one write. Blocks while more is waiting
/// than `kMostWaiting`: a peer that does not read cannot make the service grow. Takes no memory to
/// send, so that a reply that is there gets out.
class ReplySink {
 public:
  explicit ReplySink(int descriptor);

  /// Takes one whole frame.
  void send(BlockRef frame);
  /// The peer has stopped reading; everything sent from now on is dropped.
  [[nodiscard]] bool broken() const noexcept { return broken_; }

 private:
  static constexpr std::size_t kMostWaiting = std::size_t{32} << 20;  // bytes
  static constexpr std::size_t kMostFrames = 1024;

  void writeAll(const std::vector<BlockRef>& frames);

  const int descriptor_;
  std::mutex mutex_;
  std::condition_variable written_;
  std::vector<BlockRef> waiting_;
  std::vector<BlockRef> batch_;  // the writing thread's
  std::size_t waitingBytes_ = 0;
  bool writing_ = false;
  std::atomic<bool> broken_ = false;
};

}  // namespace ironmoat::host
