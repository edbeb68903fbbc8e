#pragma once

#include <sys/uio.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "client/counters.h"
#include "client/loss.h"
#include "client/request.h"
#include "client/request_ids.h"
#include "values/block_builder.h"

namespace ironmoat::client {

/// One service process, as a state machine, and the requests that were given to it. Knows no
/// process, socket or thread: its owner reports events and carries out what it asks for.
///
///     state     event                   next
///     absent    started                 greeting  the start deadline runs
///     absent    startFailed             absent    the next start waits; the fifth failure in a
///                                                 row, or a lasting one, fails all requests
///     greeting  receive (a hello)       ready     requests are sent
///     greeting  lost                    absent    as startFailed
///     ready     receive (a reply)       ready     the front has its outcome
///     ready     lost                    absent    retry or blame, see below
///     ready     dismissed               absent    an idle process was ended
///     ready     replaced                ready     an idle process gave way to a fresh one
///
/// A service answers in the order of the requests. The front is the oldest request without an
/// outcome; its deadline runs from when it becomes the front of a ready process.
///
/// Retry and blame. When a process is lost,
/// 1. a request that had the process to itself and whose deadline has passed fails with `timedOut`
///    (one that others were sent behind may be answered already: replies are written in batches);
/// 2. a request that has lost an earlier process and is the only one that this one was ever given
///    fails with `crashed`;
/// 3. any other request in flight is sent again, first and alone.
/// So only the culprit fails, after three processes at most.
///
/// Invariants: requests are in the order of `add`, but for retries, which come first; an id that
/// was not drawn for the front is never accepted; a process that is lost before its first reply and
/// blamed on no request counts as a failed start. Not thread-safe.
class Channel {
 public:
  enum class State : std::uint8_t { absent, greeting, ready };

  /// Requests sent and not yet answered, at most: bounds how many are sent again.
  static constexpr std::size_t kWindow = 256;
  /// A message of up to so many bytes is copied into one piece with its neighbours.
  static constexpr std::size_t kWorthCopying = 1024;
  static constexpr unsigned kStartAttempts = 5;

  /// A process has `startTime` to send its hello.
  Channel(Clock::duration startTime, Counters& counters);

  // From callers.
  void add(std::shared_ptr<Request> request, TimePoint now) noexcept;
  /// Drops a request that is here. It gets no outcome, and its reply is ignored.
  void cancel(Request& request, TimePoint now) noexcept;
  /// Takes out all requests but the front, which then is the last that this process answers.
  RequestList takeFollowers() noexcept;
  [[nodiscard]] State state() const noexcept { return state_; }
  [[nodiscard]] bool empty() const noexcept { return requests_.empty(); }
  [[nodiscard]] const Request* front() const noexcept { return requests_.front(); }
  /// When the front, if it was sent, will have been in work for `patience`.
  [[nodiscard]] TimePoint stalledAt(Clock::duration patience) const noexcept {
    return inFlight_ == 0 || closed_ ? TimePoint::max() : frontSince_ + patience;
  }
  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  /// Requests are being sent again one at a time.
  [[nodiscard]] bool isRetrying() const noexcept {
    return !requests_.empty() && requests_.front()->losses_ > 0;
  }
  /// Requests with an outcome, to be delivered.
  [[nodiscard]] RequestList& finished() noexcept { return finished_; }

  // Events.
  void started(TimePoint now) noexcept;
  /// `lasting`: trying again is useless.
  void startFailed(std::string_view why, bool lasting, TimePoint now) noexcept;
  /// Takes the body of one frame. Throws frames::FrameError, frames::RecordError or std::bad_alloc:
  /// the process is then to be killed and reported as lost.
  void receive(const Data& body, TimePoint now);
  void lost(const Loss& loss, TimePoint now) noexcept;
  /// The process, which owes no reply, was ended or replaced by a fresh one that sent its hello.
  void dismissed() noexcept;
  void replaced() noexcept;
  /// The loss that time has brought about, if any; to be called at `wakeAt`.
  [[nodiscard]] std::optional<Loss> expire(TimePoint now) noexcept;
  void failAll(std::string_view why) noexcept;

  // What it asks for.
  [[nodiscard]] bool wantsProcess(TimePoint now) const noexcept {
    return state_ == State::absent && !requests_.empty() && now >= nextStart_;
  }
  [[nodiscard]] TimePoint wakeAt() const noexcept;
  [[nodiscard]] bool hasUnsent() const noexcept {
    return state_ == State::ready && unsent_ != nullptr && inFlight_ < window();
  }
  /// There is enough unsent to be worth a system call while the process has work: half as much.
  [[nodiscard]] bool isWorthSending() const noexcept {
    return hasUnsent() && (sentOfNext_ > 0 || size_ - inFlight_ >= inFlight_ / 2);
  }
  [[nodiscard]] std::size_t inFlight() const noexcept { return inFlight_; }
  /// Something was sent and is not answered.
  [[nodiscard]] bool owesReply() const noexcept { return begun() > 0; }
  /// Fills `parts`, at least two, with what can be sent and returns how many it used. They are
  /// valid until the next call of any function here.
  std::size_t gather(std::span<iovec> parts) noexcept;
  /// The first `bytes` of what `gather` gave were sent.
  void sent(std::size_t bytes) noexcept;

  /// No other request may be added: the process answers the front and nothing else.
  [[nodiscard]] bool isClosed() const noexcept { return closed_; }
  /// Requests answered by the present process, and how many of them in a row took more than half of
  /// their deadline.
  [[nodiscard]] std::uint64_t answered() const noexcept { return answered_; }
  [[nodiscard]] unsigned slowInARow() const noexcept { return slowInARow_; }

 private:
  static constexpr std::size_t kAtOnce = 64;  // requests that `gather` gives out

  std::shared_ptr<Request> popFront() noexcept;
  void finish(std::shared_ptr<Request> request) noexcept;
  void fail(std::shared_ptr<Request> request, Failure failure) noexcept;
  void startClock(TimePoint now) noexcept;
  void resetProcess() noexcept;
  [[nodiscard]] std::size_t window() const noexcept { return isRetrying() ? 1 : kWindow; }
  [[nodiscard]] std::size_t begun() const noexcept { return inFlight_ + (sentOfNext_ > 0 ? 1 : 0); }
  [[nodiscard]] bool blame(const Loss& loss) noexcept;

  const Clock::duration startTime_;
  Counters& counters_;
  RequestIds ids_;
  State state_ = State::absent;

  RequestList requests_;
  std::size_t size_ = 0;        // of requests_
  Request* unsent_ = nullptr;   // the first one not wholly sent
  std::size_t sentOfNext_ = 0;  // bytes of its frame that were sent
  std::size_t inFlight_ = 0;    // wholly sent, not answered
  RequestList finished_;
  BlockBuilder staged_;  // what `gather` writes

  // Of the present process.
  std::uint64_t given_ = 0;  // requests of which it got any byte
  std::uint64_t answered_ = 0;
  unsigned slowInARow_ = 0;
  bool closed_ = false;
  bool wasShared_ = false;  // requests that were taken out had been sent behind the front
  TimePoint frontSince_{};
  TimePoint greetBy_{};

  unsigned startFailures_ = 0;  // in a row
  TimePoint nextStart_{};
};

}  // namespace ironmoat::client
