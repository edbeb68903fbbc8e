#pragma once

#include <sys/uio.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <mutex>
#include <optional>
#include <span>
#include <vector>

#include "frames/brief_wait.h"
#include "frames/frame_assembler.h"
#include "ironmoat/block.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::host {

/// Requests off a descriptor, one at a time to whichever thread asks.
///
/// Threads take turns at reading, and as few of them as will do: waking one takes longer than
/// unpacking an ordinary message. Who has read goes on with what came and then reads again, while
/// the others wait. One of them, the watcher, is called in when there is work for two; and where
/// the one at work stays away for long, it steps in by itself. So no request, and no reply that is
/// held back, waits behind a slow message as long as a thread is free.
///
/// On a socket, which it makes one that does not block, the thread that reads looks again for a
/// while before it sleeps, and gives the process's spare memory back after a second of nothing.
class RequestSource {
 public:
  explicit RequestSource(int descriptor);

  /// The next request's frame body, in a block for the calling thread alone; nothing at the end of
  /// input (also in the middle of a frame), after `close`, and after a frame that could not be
  /// trusted, for which one caller gets the FrameError. `beforeWaiting` is called, with no lock
  /// held, each time before the thread waits, and when it steps in for another; it throws nothing.
  std::optional<Data> next(const std::function<void()>& beforeWaiting);
  void close();

 private:
  using Lock = std::unique_lock<std::mutex>;

  std::optional<Data> take();
  /// How many bytes came; none at the end of input.
  std::size_t readSome(std::span<char> room) noexcept;
  /// Waits until there may be something to do. True: it is another thread's, who takes too long.
  bool watch(Lock& lock);
  void end() noexcept;

  const int descriptor_;
  std::mutex mutex_;
  frames::FrameAssembler assembler_;  // the reading thread's, while there is one
  bool ended_ = false;
  bool reading_ = false;
  frames::BriefWait wait_{std::chrono::microseconds(20)};  // the reading thread's
  std::uint64_t taken_ = 0;                                // requests
  bool watching_ = false;                                  // there is a watcher,
  bool asleep_ = false;  // ... and it looks up only when it is called
  bool called_ = false;  // ... and it was called in
  std::condition_variable watcher_;
  std::condition_variable others_;
};

/// Replies onto a descriptor, from any thread. They are held back until `flush`, or until there are
/// enough to be worth a system call. A thread that finds another one writing leaves its replies to
/// it. Blocks while more is waiting than `kMostWaiting`: a peer that does not read cannot make the
/// service grow. Takes no memory to send, so that a reply that is there gets out.
class ReplySink {
 public:
  explicit ReplySink(int descriptor);

  /// Takes one whole frame out of the builder. That of a small one keeps its memory for the next.
  void add(BlockBuilder& frame);
  void flush();
  /// The peer has stopped reading; everything sent from now on is dropped.
  [[nodiscard]] bool broken() const noexcept { return broken_; }

 private:
  using Lock = std::unique_lock<std::mutex>;

  static constexpr std::size_t kMostWaiting = std::size_t{32} << 20;  // bytes
  static constexpr std::size_t kMostFrames = 1024;
  static constexpr std::size_t kSmall = std::size_t{4} << 10;          // bytes
  static constexpr std::size_t kWorthWriting = std::size_t{16} << 10;  // bytes

  /// Small frames, one behind the other, and large ones.
  struct Batch {
    std::vector<char> small;
    std::vector<BlockRef> large;
    [[nodiscard]] bool empty() const noexcept { return small.empty() && large.empty(); }
    void clear() noexcept {
      small.clear();
      large.clear();
    }
  };

  [[nodiscard]] bool hasRoom() const noexcept;
  void write(Lock& lock);
  void writeAll(std::span<iovec> pieces);
  void writeAll(const Batch& batch);

  const int descriptor_;
  std::mutex mutex_;
  std::condition_variable written_;
  Batch waiting_;
  Batch batch_;  // the writing thread's
  std::size_t waitingBytes_ = 0;
  bool writing_ = false;
  std::atomic<bool> broken_ = false;
};

}  // namespace ironmoat::host
