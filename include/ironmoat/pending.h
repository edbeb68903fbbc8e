#pragma once

#include <chrono>
#include <future>
#include <memory>
#include <utility>

#include "ironmoat/api.h"
#include "ironmoat/message_schema.h"
#include "ironmoat/outcome.h"

namespace ironmoat {

namespace client {
struct Core;
class Request;
}  // namespace client

/// The outcome-to-be of a request, used as a std::future is.
///
/// May outlive its client: destroying the client completes the request with `unavailable`.
/// Destroying a Pending does not cancel its request. Any thread may use it, one at a time. After
/// fork() it belongs to the parent: in the child a request without an outcome is `unavailable`.
template <MessageSchema R>
class IRONMOAT_API Pending {
 public:
  Pending() noexcept = default;
  Pending(Pending&&) noexcept = default;
  ~Pending();
  Pending& operator=(Pending&& other) noexcept {
    Pending before = std::move(other);
    request_.swap(before.request_);
    core_.swap(before.core_);
    return *this;
  }

  /// Stands for a request whose outcome was not taken: required by everything below.
  [[nodiscard]] bool valid() const noexcept { return request_ != nullptr; }

  /// Waits for the record. Throws DecodingError when the message was rejected, ServiceError when
  /// the service gave no answer, and std::bad_alloc.
  R get();
  /// Waits for the outcome; throws nothing for what it is.
  Outcome<R> outcome();
  void wait() const { static_cast<void>(waitUntil(Clock::time_point::max())); }
  // NOLINTBEGIN(readability-identifier-naming): std::future's names
  /// `ready`, or `timeout` when the time is up. A time of zero or less only looks.
  template <class Rep, class Period>
  std::future_status wait_for(const std::chrono::duration<Rep, Period>& time) const {
    const Seconds seconds = time;
    if (seconds >= std::chrono::years(100)) return waitUntil(Clock::time_point::max());
    if (seconds <= Seconds::zero()) return waitUntil(Clock::time_point());
    return waitUntil(Clock::now() + std::chrono::ceil<Clock::duration>(seconds));
  }
  template <class Time>
  std::future_status wait_until(const Time& time) const {
    return wait_for(Seconds(time.time_since_epoch()) -
                    Seconds(Time::clock::now().time_since_epoch()));
  }
  // NOLINTEND(readability-identifier-naming)

 private:
  friend class Client;
  using Clock = std::chrono::steady_clock;
  using Seconds = std::chrono::duration<long double>;  // no time overflows it

  Pending(std::shared_ptr<client::Request> request, std::shared_ptr<client::Core> core)
      : core_(std::move(core)), request_(std::move(request)) {}
  std::future_status waitUntil(Clock::time_point until) const;

  std::shared_ptr<client::Core> core_;  // outlives the request
  std::shared_ptr<client::Request> request_;
};

}  // namespace ironmoat
