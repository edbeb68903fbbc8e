#pragma once

#include <algorithm>
#include <chrono>
#include <thread>

namespace ironmoat::frames {

/// Waits for a peer that is at work on another processor: as long as it is near, looks again for a
/// while before it sleeps. Falling asleep and being woken takes 10 to 90 microseconds, in which the
/// peer is done with ten messages; a round trip takes half as long without. A peer that comes later
/// than `kNear` time and again is not near: then it costs nothing. For one thread at a time.
class BriefWait {
 public:
  using Clock = std::chrono::steady_clock;

  /// `patience`: how long it looks again, at most.
  explicit BriefWait(Clock::duration patience) : patience_(patience) {}

  /// `look` says whether what is waited for has come; `sleep` returns when it may have.
  template <class Look, class Sleep>
  void operator()(Look&& look, Sleep&& sleep) {
    if (look()) return;
    if (!kOthersRun) return sleep();
    const auto start = Clock::now();
    while (trust_ > 0 && Clock::now() - start < patience_) {
      std::this_thread::yield();
      if (look()) {
        trust_ = kMostTrust;
        return;
      }
    }
    sleep();
    if (Clock::now() - start < kNear) {
      trust_ = std::max(trust_, 1);
    } else if (trust_ > 0) {
      --trust_;
    }
  }

 private:
  static constexpr auto kNear = std::chrono::microseconds(150);
  static constexpr int kMostTrust = 8;
  static inline const bool kOthersRun = std::thread::hardware_concurrency() > 1;

  const Clock::duration patience_;
  int trust_ = 0;  // waits of which it is expected to come soon
};

}  // namespace ironmoat::frames
