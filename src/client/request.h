#pragma once

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <list>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "client/counters.h"
#include "frames/frame.h"
#include "ironmoat/errors.h"
#include "ironmoat/tsan.h"
#include "ironmoat/values.h"

namespace ironmoat::client {

using Clock = std::chrono::steady_clock;
using TimePoint = Clock::time_point;

/// For poll and the like: -1 for TimePoint::max(), at most an hour.
inline int millisecondsUntil(TimePoint at) noexcept {
  if (at == TimePoint::max()) return -1;
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(at - Clock::now());
  return static_cast<int>(std::clamp<std::chrono::milliseconds::rep>(left.count(), 0, 3'600'000));
}

/// A ServiceError with the text that `make` returns; std::bad_alloc if there is no memory for it.
template <class Make>
Failure serviceError(ServiceError::Kind kind, const Make& make) noexcept {
  try {
    return ServiceError(kind, make());
  } catch (const std::bad_alloc& error) {
    return error;
  }
}

/// One message on its way to one outcome. Used by one thread at a time, but for `isDone`.
class Request {
 public:
  Request(Counters& counters, std::string_view outputType, Data message, Clock::duration deadline)
      : outputType_(outputType),
        message_(std::move(message)),
        deadline_(deadline),
        counters_(counters),
        inFlight_(std::in_place, counters, message_.size()) {}
  Request(const Request&) = delete;
  Request& operator=(const Request&) = delete;
  virtual ~Request() { detail::announceAcquire(done_); }

  /// A record type's schemaName.
  [[nodiscard]] std::string_view outputType() const noexcept { return outputType_; }
  [[nodiscard]] const Data& message() const noexcept { return message_; }
  [[nodiscard]] Clock::duration deadline() const noexcept { return deadline_; }
  /// It lost a process and must be alone in the next one.
  [[nodiscard]] bool isRetried() const noexcept { return retried_; }
  [[nodiscard]] bool isCancelled() const noexcept { return cancelled_; }

  /// Its outcome is no longer wanted: it will complete without one.
  virtual void cancel() noexcept { cancelled_ = true; }
  /// Completes the request with what the reply says. Throws frames::RecordError or
  /// frames::FrameError if no service sends such a reply; the request is then not complete.
  void resolve(const frames::Reply& reply) {
    if (!cancelled_) counters_.count(read(reply));
    complete();
  }
  void fail(Failure failure) noexcept {
    if (!cancelled_) {
      counters_.count(&failure);
      set(std::move(failure));
    }
    complete();
  }
  /// Completes a cancelled request.
  void drop() noexcept { complete(); }
  /// Any thread. The outcome belongs to the thread that has seen this return true. Pairs with the
  /// release in `complete`.
  [[nodiscard]] bool isDone() const noexcept {
    if (!done_.load(std::memory_order_acquire)) return false;
    detail::announceAcquire(done_);
    return true;
  }
  /// Tells ThreadSanitizer that this thread no longer uses the request.
  void announceEnd() const noexcept { detail::announceRelease(done_); }
  /// `deliver` has a completion to call.
  [[nodiscard]] virtual bool hasCompletion() const noexcept = 0;
  /// Calls the completion, once; until then the request counts as in flight.
  void deliver() noexcept {
    inFlight_.reset();
    callCompletion();
    announceEnd();
  }

 protected:
  [[nodiscard]] Counters& counters() const noexcept { return counters_; }

 private:
  friend class Channel;

  /// Takes the outcome out of the reply; returns the failure, or null for a record.
  virtual const Failure* read(const frames::Reply& reply) = 0;
  virtual void set(Failure failure) noexcept = 0;
  virtual void callCompletion() noexcept = 0;
  void complete() noexcept {
    if (cancelled_) counters_.add(&Stats::cancelled);
    if (!hasCompletion()) inFlight_.reset();
    detail::announceRelease(done_);
    done_.store(true, std::memory_order_release);
  }

  const std::string_view outputType_;
  const Data message_;
  const Clock::duration deadline_;
  Counters& counters_;
  std::optional<InFlight> inFlight_;
  bool cancelled_ = false;
  mutable std::atomic<bool> done_ = false;

  // The channel's notes.
  std::uint64_t id_ = 0;  // in the frames of the current attempt
  TimePoint due_{};       // when the deadline ends; none while other requests go first
  bool retried_ = false;
};

/// Requests in order. Moving them between lists (`splice`) takes no memory, so that a request that
/// was once accepted is never lost for want of it.
using RequestList = std::list<std::shared_ptr<Request>>;

inline void append(RequestList& to, RequestList& from) noexcept { to.splice(to.end(), from); }

inline RequestList takeFirst(RequestList& from) noexcept {
  RequestList first;
  first.splice(first.end(), from, from.begin());
  return first;
}

/// Fails all of `requests` with `unavailable`; they are then in `finished`.
inline void failAll(RequestList& requests, RequestList& finished, std::string_view why) noexcept {
  for (const auto& request : requests) {
    request->fail(serviceError(ServiceError::Kind::unavailable, [&] { return std::string(why); }));
  }
  append(finished, requests);
}

/// Calls the completions; these may change the list that the requests were taken from.
// NOLINTNEXTLINE(performance-unnecessary-value-param): it must own them
inline void deliverAll(RequestList requests) noexcept {
  for (const auto& request : requests) request->deliver();
}

}  // namespace ironmoat::client
