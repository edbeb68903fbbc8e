#pragma once

#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <mutex>

namespace ironmoat::client {

/// Bounds the bytes in flight: lets threads in, in the order they came, while there is room. What
/// is larger than all the room is let in alone. Used under its owner's mutex.
class Admission {
 public:
  explicit Admission(std::size_t room) : room_(room) {}

  /// Waits for room and takes it; false when `stop` came first.
  bool enter(std::unique_lock<std::mutex>& lock, std::size_t bytes) {
    const std::uint64_t ticket = nextTicket_++;
    changed_.wait(lock, [&] {
      return stopped_ ||
             (ticket == admitted_ && (taken_ == 0 || (taken_ <= room_ && bytes <= room_ - taken_)));
    });
    ++admitted_;
    if (othersWait()) changed_.notify_all();
    if (!stopped_) taken_ += bytes;
    return !stopped_;
  }
  void leave(std::size_t bytes) noexcept {
    taken_ -= bytes;
    if (othersWait()) changed_.notify_all();
  }
  void stop() noexcept {
    stopped_ = true;
    changed_.notify_all();
  }

 private:
  [[nodiscard]] bool othersWait() const noexcept { return admitted_ != nextTicket_; }

  const std::size_t room_;
  std::size_t taken_ = 0;
  std::uint64_t nextTicket_ = 0;
  std::uint64_t admitted_ = 0;
  bool stopped_ = false;
  std::condition_variable changed_;
};

}  // namespace ironmoat::client
