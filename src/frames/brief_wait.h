#pragma once

#include <algorithm>
#include <chrono>
#include <thread>
#include <utility>

namespace ironmoat::frames {

/// Waits for a peer that is at work on another processor: as long as it is near, looks again for a
/// while before it sleeps. Falling asleep and being woken takes 10 to 90 microseconds, in which the
/// peer is done with ten messages; a round trip takes half as long without. A peer that comes later
/// than `kNear` time and again is not near: then it costs nothing. For one thread at a time.
///
/// Both may have come to run on one processor, where they take turns, a round trip takes twice as
/// long and the kernel may leave them for 10 to 30 ms. That shows in the time for which a look is
/// held up. Who sleeps then is mostly woken on another processor, if there is one: a tenth off the
/// time of round trips and pipelines in a process's first 50 ms. As it may not help, it is done for
/// one wait of 32 at most.
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
    if (crowded_ == kMostCrowded) {
      crowded_ = -kRarely;
    } else if (trust_ > 0 && lookAgain(start, look)) {
      trust_ = kMostTrust;
      return;
    }
    sleep();
    if (Clock::now() - start < kNear) {
      trust_ = std::max(trust_, 1);
    } else if (trust_ > 0) {
      --trust_;
    }
  }

 private:
  template <class Look>
  bool lookAgain(Clock::time_point start, Look&& look) {
    bool came = false;
    bool heldUp = false;
    for (auto now = start; !came && now - start < patience_;) {
      std::this_thread::yield();
      const auto before = std::exchange(now, Clock::now());
      heldUp = heldUp || now - before > kHeldUp;
      came = look();
    }
    crowded_ = heldUp || crowded_ < 0 ? crowded_ + 1 : 0;
    return came;
  }

  static constexpr auto kNear = std::chrono::microseconds(150);
  static constexpr int kMostTrust = 8;
  static constexpr auto kHeldUp = std::chrono::nanoseconds(2500);  // three looks
  static constexpr int kMostCrowded = 2;
  static constexpr int kRarely = 30;
  static inline const bool kOthersRun = std::thread::hardware_concurrency() > 1;

  const Clock::duration patience_;
  int trust_ = 0;    // waits of which it is expected to come soon
  int crowded_ = 0;  // waits in a row that were held up; below 0, minus those to let pass
};

}  // namespace ironmoat::frames
