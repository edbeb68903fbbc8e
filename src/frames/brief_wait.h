#pragma once

#include <chrono>
#include <thread>

namespace ironmoat::frames {

/// Waits for a peer that is at work on another processor: where the last wait was over soon, it
/// looks again for a while before it sleeps. Falling asleep and being woken takes either side
/// several microseconds, more than the peer needs for ten messages; a peer that is not that near
/// costs one wait of looking at most. For one thread at a time.
class BriefWait {
 public:
  /// `look` says whether what is waited for has come; `sleep` returns when it may have.
  template <class Look, class Sleep>
  void operator()(Look&& look, Sleep&& sleep) {
    if (look()) return;
    if (!kOthersRun) return sleep();
    const auto start = Clock::now();
    while (soon_ && Clock::now() - start < kPatience) {
      std::this_thread::yield();
      if (look()) return;
    }
    sleep();
    soon_ = Clock::now() - start < kSoon;
  }

 private:
  using Clock = std::chrono::steady_clock;
  static constexpr auto kPatience = std::chrono::microseconds(20);
  static constexpr auto kSoon = std::chrono::microseconds(50);
  static inline const bool kOthersRun = std::thread::hardware_concurrency() > 1;

  bool soon_ = false;
};

}  // namespace ironmoat::frames
