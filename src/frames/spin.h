#pragma once

#include <algorithm>
#include <chrono>
#include <thread>

#if defined(__x86_64__)
#include <immintrin.h>
#endif

namespace ironmoat::frames {

/// Polls for a moment before a thread blocks: a peer that answers within microseconds is then heard
/// without the cost of a wake-up. Both ends of a connection wait this way. Not thread-safe.
///
/// A spin lasts at most kBound and never yields, so that a busy neighbour cannot turn it into a
/// time slice. When it finds nothing, the next waits block at once: one, then three, up to
/// kMaxSkipped. When the thread lost its processor meanwhile, the machine has no processor to spare
/// and kCrowdedSkipped waits block at once. With a single processor nothing ever spins.
class Spin {
 public:
  using Clock = std::chrono::steady_clock;

  static constexpr auto kBound = std::chrono::microseconds(50);

  /// Calls `ready` until it returns true; returns false when the caller has to block.
  template <class Ready>
  [[nodiscard]] bool operator()(Ready&& ready) {
    if (skip_ > 0) {
      --skip_;
      return false;
    }
    if (!kOthersRun) return false;
    const auto start = Clock::now();
    auto now = start;
    bool found = false;
    while (!found && now - start < kBound) {
      pause();
      found = ready();
      now = Clock::now();
    }
    if (now - start > kBound + kPreempted) {
      skip_ = kCrowdedSkipped;
    } else if (found) {
      failed_ = 0;
    } else {
      skip_ = failed_ = std::min(2 * failed_ + 1, kMaxSkipped);
    }
    return found;
  }

 private:
  static void pause() noexcept {
#if defined(__x86_64__)
    _mm_pause();
#elif defined(__aarch64__)
    for (int i = 0; i < 16; ++i) asm volatile("isb");
#endif
  }

  static constexpr auto kPreempted = std::chrono::microseconds(100);
  static constexpr int kMaxSkipped = 63;
  static constexpr int kCrowdedSkipped = 100;
  static inline const bool kOthersRun = std::thread::hardware_concurrency() > 1;

  int skip_ = 0;    // waits to come that block at once
  int failed_ = 0;  // what the last spin that found nothing set `skip_` to
};

}  // namespace ironmoat::frames
