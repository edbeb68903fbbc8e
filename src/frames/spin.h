#pragma once

#include <algorithm>
#include <chrono>
#include <thread>

namespace ironmoat::frames {

/// Polls for a moment before a thread blocks: a peer that answers within microseconds is then heard
/// without the cost of a wake-up. Both ends of a connection wait this way. Not thread-safe.
///
/// A spin lasts at most kMaxTime and never yields, since a yield can last a time slice. When it
/// finds nothing, the next waits block at once: one, then three, up to kMaxSkipped. When the thread
/// loses its processor meanwhile, no processor is idle, and kMaxSkipped waits block at once. On a
/// single processor all waits do.
class Spin {
 public:
  using Clock = std::chrono::steady_clock;

  static constexpr auto kMaxTime = std::chrono::microseconds(50);

  /// Calls `ready` until it returns true; returns false if the caller has to block.
  template <class Ready>
  [[nodiscard]] bool operator()(Ready&& ready) {
    if (!kOthersRun) return false;
    if (skip_ > 0) return --skip_, false;
    const auto start = Clock::now();
    Clock::duration time{};
    bool found = false;
    while (!found && time < kMaxTime) {
      pause();
      found = ready();
      time = Clock::now() - start;
    }
    if (time > kPreempted) {
      skip_ = kMaxSkipped;
    } else {
      skip_ = failed_ = found ? 0 : std::min(2 * failed_ + 1, kMaxSkipped);
    }
    return found;
  }

 private:
  static void pause() noexcept {
#if defined(__x86_64__)
    __builtin_ia32_pause();
#elif defined(__aarch64__)
    for (int i = 0; i < 16; ++i) asm volatile("isb");
#endif
  }

  static constexpr auto kPreempted = std::chrono::microseconds(150);
  static constexpr int kMaxSkipped = 63;
  static inline const bool kOthersRun = std::thread::hardware_concurrency() > 1;

  int skip_ = 0;    // waits to come that block at once
  int failed_ = 0;  // what the last spin in vain set `skip_` to
};

}  // namespace ironmoat::frames
