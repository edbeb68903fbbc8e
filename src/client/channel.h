#pragma once

#include <sys/uio.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "client/request.h"
#include "values/block_builder.h"

namespace ironmoat::client {

/// What ended a service process or made it useless.
struct Loss {
  enum class Why : std::uint8_t {
    ended,      ///< it ended or closed its connection by itself
    violation,  ///< it sent what no service sends
    deadline,   ///< it did not answer in time
  };
  Why why = Why::ended;
  std::string what;  ///< "was killed by SIGSEGV", "sent a broken frame: ..."
};

/// The text that `make` returns, or none for want of memory: the loss is what counts.
template <class Make>
std::string textOrNone(const Make& make) noexcept {
  try {
    return make();
  } catch (const std::bad_alloc&) {
    return {};
  }
}

/// The hello in the body of a frame. Throws frames::FrameError if it is none, or that of a service
/// that this client must not use.
frames::Hello usableHello(const Data& body);

/// Ids that a service cannot guess before it has read them, so that nothing it sent earlier can
/// pass for the reply. Never 0, which answers a frame without an id.
class RequestIds {
 public:
  std::uint64_t next() noexcept;

 private:
  std::array<std::uint64_t, 32> pool_;  // NOLINT: read only below left_
  std::size_t left_ = 0;
};

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
///     ready     dismissed               absent    its owner ended an idle process
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
/// blamed on no request counts as a failed start, until a request that was in it is blamed for
/// another one. Not thread-safe.
class Channel {
 public:
  enum class State : std::uint8_t { absent, greeting, ready };

  /// Requests in flight, at most: bounds how many are sent again.
  static constexpr std::size_t kWindow = 256;
  static constexpr unsigned kStartAttempts = 5;

  /// A process has `startTime` to send its hello.
  Channel(Clock::duration startTime, Counters& counters);

  // Requests.
  void add(RequestList requests, TimePoint now) noexcept;
  /// Takes out all requests but the front, which is the last that this process answers. Requires
  /// that the front is in flight.
  RequestList takeFollowers() noexcept;
  void failAll(std::string_view why) noexcept;
  /// Complete requests, for the owner to take.
  [[nodiscard]] RequestList& finished() noexcept { return finished_; }

  // Events.
  void started(TimePoint now) noexcept;
  /// `lasting`: trying again is useless.
  void startFailed(std::string_view why, bool lasting, TimePoint now) noexcept;
  /// Takes the body of one frame. Throws frames::FrameError, frames::RecordError or std::bad_alloc:
  /// the owner must then kill the process and report it as lost.
  void receive(const Data& body, TimePoint now);
  void lost(const Loss& loss, TimePoint now) noexcept;
  void dismissed() noexcept;
  /// The loss that time has brought about, if any; to be called at `wakeAt`.
  [[nodiscard]] std::optional<Loss> expire(TimePoint now) noexcept;

  // What it asks for.
  [[nodiscard]] bool wantsProcess(TimePoint now) const noexcept {
    return state_ == State::absent && !requests_.empty() && now >= nextStart_;
  }
  [[nodiscard]] TimePoint wakeAt() const noexcept;
  [[nodiscard]] bool hasOutput() const noexcept { return hasEncoded() || canEncode(); }
  /// There is enough to send to be worth a system call: half as much as is in flight.
  [[nodiscard]] bool isWorthSending() const noexcept {
    return hasEncoded() || (canEncode() && unsent() >= inFlight_ / 2);
  }
  /// Its owner must wait for room in the socket: no reply will come before more was sent.
  [[nodiscard]] bool wantsRoom() const noexcept { return hasEncoded() && wholeInFlight_ == 0; }
  /// Bytes to send, valid until the next call of any function here.
  [[nodiscard]] std::array<iovec, 2> output() noexcept;
  /// The first `bytes` of `output` were sent.
  void sent(std::size_t bytes) noexcept;

  [[nodiscard]] State state() const noexcept { return state_; }
  [[nodiscard]] bool empty() const noexcept { return requests_.empty(); }
  [[nodiscard]] std::size_t size() const noexcept { return requests_.size(); }
  [[nodiscard]] const Request& front() const noexcept { return *requests_.front(); }
  /// The one behind the front.
  [[nodiscard]] const Request& follower() const noexcept { return **++requests_.begin(); }
  [[nodiscard]] std::size_t inFlight() const noexcept { return inFlight_; }
  [[nodiscard]] std::size_t unsent() const noexcept { return requests_.size() - inFlight_; }
  /// When the front, if it is in flight, will have been in work for `patience`.
  [[nodiscard]] TimePoint stalledAt(Clock::duration patience) const noexcept {
    return inFlight_ == 0 || closed_ ? TimePoint::max() : frontSince_ + patience;
  }
  /// Requests are being sent again one at a time.
  [[nodiscard]] bool isRetrying() const noexcept { return !empty() && front().isRetried(); }
  /// The followers were taken out: no request may be added.
  [[nodiscard]] bool isClosed() const noexcept { return closed_; }
  /// Requests that this process answered, and how many of them in a row took more than half of
  /// their deadline.
  [[nodiscard]] std::uint64_t answered() const noexcept { return answered_; }
  [[nodiscard]] unsigned slowInARow() const noexcept { return slowInARow_; }

 private:
  [[nodiscard]] std::size_t window() const noexcept { return isRetrying() ? 1 : kWindow; }
  [[nodiscard]] bool hasEncoded() const noexcept {
    return encodedSent_ < encoded_.size() || !tail_.empty();
  }
  [[nodiscard]] bool canEncode() const noexcept {
    return state_ == State::ready && unsent_ != requests_.end() && inFlight_ < window();
  }
  void encodeNext() noexcept;
  void startClock(TimePoint now) noexcept;
  [[nodiscard]] bool blame(RequestList& suspects, const Loss& loss) noexcept;
  void forgetProcess() noexcept;

  const Clock::duration startTime_;
  Counters& counters_;
  RequestIds ids_;
  State state_ = State::absent;
  RequestList requests_;
  RequestList finished_;
  unsigned startFailures_ = 0;  // in a row
  TimePoint nextStart_{};
  TimePoint greetBy_{};

  // Of the current process.
  std::size_t inFlight_ = 0;       // encoded and not answered
  std::size_t wholeInFlight_ = 0;  // of these, at least so many were sent to the last byte
  RequestList::iterator unsent_ = requests_.begin();  // the first one that is not encoded
  BlockBuilder encoded_;                              // frames, sent up to encodedSent_
  std::size_t encodedSent_ = 0;
  std::string_view tail_;  // what is not yet sent of a long message, the last of encoded_
  std::uint64_t given_ = 0;
  std::uint64_t answered_ = 0;
  unsigned slowInARow_ = 0;
  bool closed_ = false;
  bool wasShared_ = false;  // the requests that were taken out were in flight
  TimePoint frontSince_{};
};

}  // namespace ironmoat::client
