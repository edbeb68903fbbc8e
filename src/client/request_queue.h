#pragma once

#include <sys/uio.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <span>

#include "client/request.h"
#include "values/block_builder.h"

namespace ironmoat::client {

/// All requests without an outcome, in the order they came: which bytes to send next, which replies
/// are owed, whose time is up, and who is to blame when a service process is gone.
///
/// Blame. A request is blamed only for a process that was never given another one. Any other death
/// makes suspects of all requests that had been given to the process; these go first to the next
/// process, one at a time, and each death then puts its request at the start of a new process.
///
/// Clocks. A service takes requests in the order they were sent. A request's clock runs once
/// nothing sent before it is still owed, or once something sent after it was answered: never while
/// it may be waiting for another. The front's clock is therefore always the first to run out.
///
/// Knows no process, socket or thread; not thread-safe.
class RequestQueue {
 public:
  using Clock = std::chrono::steady_clock;
  using TimePoint = Clock::time_point;
  /// Requests given to a process and not yet answered, at most: bounds how many become suspects.
  static constexpr std::size_t kWindow = 256;

  static constexpr std::size_t kWorthSending = 32;
  /// That `gather` gives out, at most, in two parts each.
  static constexpr std::size_t kMostAtOnce = 64;
  /// Bytes of a message that `gather` copies, at most: the system takes longer over another part.
  static constexpr std::size_t kWorthCopying = 1024;

  explicit RequestQueue(Clock::duration deadline);

  /// Returns its id.
  std::uint64_t push(std::shared_ptr<Request> request, TimePoint now);
  [[nodiscard]] bool empty() const noexcept { return slots_.empty(); }

  /// A fresh process is ready: sending starts over.
  void restart(TimePoint now);
  /// Fills `parts`, two at least, with what can be sent now and returns how many it used; they are
  /// valid until the next call of any function here. Takes no memory: what was taken in gets out.
  std::size_t gather(std::span<iovec> parts);
  /// The first `bytes` of what `gather` gave have been sent.
  void sent(std::size_t bytes);
  [[nodiscard]] bool hasUnsent() const noexcept;
  /// There is enough unsent to be worth a system call, for a service that has work meanwhile: as
  /// much again as it has, or kWorthSending. A single request is, when none is under way.
  [[nodiscard]] bool isWorthSending() const noexcept {
    return sendableEnd() - next_ >= std::clamp<std::size_t>(owedCount_, 1, kWorthSending);
  }

  /// The request that `id` names, if its reply is owed; it stays owed until `finish`.
  [[nodiscard]] Request* owed(std::uint64_t id) noexcept;
  [[nodiscard]] bool owesAny() const noexcept { return owedCount_ != 0 || sentOfNext_ != 0; }
  /// Takes a request with an outcome out.
  std::shared_ptr<Request> finish(std::uint64_t id, TimePoint now);

  /// When the front's time is up; nothing while no clock runs.
  [[nodiscard]] std::optional<TimePoint> expiry() const noexcept;

  /// The process is gone. Returns the request to blame, taken out, if there is one.
  std::shared_ptr<Request> lose() noexcept;
  /// Takes the first request out. Requires that there is one and that no process is.
  std::shared_ptr<Request> takeFront() noexcept;

 private:
  struct Slot {
    std::shared_ptr<Request> request;  // none: it has its outcome
    TimePoint clock{};
  };

  [[nodiscard]] Slot& slot(std::uint64_t id) noexcept { return slots_[id - front_]; }
  [[nodiscard]] const Slot& slot(std::uint64_t id) const noexcept { return slots_[id - front_]; }
  [[nodiscard]] std::uint64_t end() const noexcept { return front_ + slots_.size(); }
  [[nodiscard]] std::uint64_t sendableEnd() const noexcept;
  void dropFinished() noexcept;
  void runClocks(std::uint64_t before, TimePoint now) noexcept;

  const Clock::duration deadline_;
  std::deque<Slot> slots_;         // the first one always holds a request
  std::uint64_t front_ = 1;        // id of the first slot
  std::uint64_t next_ = 1;         // id of the first request not wholly sent
  std::size_t sentOfNext_ = 0;     // bytes of its frame that were
  std::uint64_t clocked_ = 1;      // ids below have a running clock
  std::uint64_t suspectsEnd_ = 1;  // ids below are sent one at a time
  std::size_t owedCount_ = 0;      // wholly sent, not answered
  std::uint64_t begun_ = 0;        // requests that this process was given any byte of
  bool ready_ = false;
  BlockBuilder staged_;  // what `gather` writes itself
};

}  // namespace ironmoat::client
