#pragma once

#include <chrono>
#include <future>
#include <memory>
#include <utility>

#include "ironmoat/api.h"
#include "ironmoat/message_schema.h"

namespace ironmoat {

namespace client {
class Connection;
class Request;
}  // namespace client

/// The outcome of one request, used as a std::future is. Unlike one it lets the thread that waits
/// read the replies itself, so that no other has to be woken for each.
///
/// May outlive its client, whose end is an outcome, too; without being asked, the request goes on
/// all the same. Any thread may use it, one at a time. After fork() it belongs to the parent: in
/// the child what had no outcome then is `unavailable`.
template <MessageSchema R>
class IRONMOAT_API Pending {
 public:
  Pending() noexcept = default;
  Pending(Pending&&) noexcept = default;
  Pending& operator=(Pending&&) noexcept = default;

  /// It stands for a request, and `get` was not called: required by all below.
  [[nodiscard]] bool valid() const noexcept { return request_ != nullptr; }

  /// Waits for the record. Throws DecodingError when the message is refused, ServiceError when no
  /// answer could be had, std::bad_alloc.
  R get();
  void wait() const { static_cast<void>(waitUntil(Clock::time_point::max())); }
  // NOLINTBEGIN(readability-identifier-naming): std::future's names
  /// `ready` or, when the time is up, `timeout`; with no time at all it looks what has come.
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
  using Seconds = std::chrono::duration<long double>;  // no time overflows in it

  Pending(std::shared_ptr<client::Request> request, std::shared_ptr<client::Connection> connection)
      : request_(std::move(request)), connection_(std::move(connection)) {}
  std::future_status waitUntil(Clock::time_point until) const;

  std::shared_ptr<client::Request> request_;
  std::shared_ptr<client::Connection> connection_;
};

}  // namespace ironmoat
