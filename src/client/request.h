#pragma once

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>
#include <string>
#include <string_view>
#include <utility>
#include <variant>

#include "frames/frame.h"
#include "ironmoat/errors.h"
#include "ironmoat/values.h"

namespace ironmoat::client {

using Clock = std::chrono::steady_clock;
using TimePoint = Clock::time_point;

/// For poll and the like: -1 for TimePoint::max(), an hour at most.
inline int millisecondsUntil(TimePoint at) noexcept {
  if (at == TimePoint::max()) return -1;
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(at - Clock::now());
  return static_cast<int>(std::clamp<std::chrono::milliseconds::rep>(left.count(), 0, 3'600'000));
}

using Failure = std::variant<DecodingError, ServiceError, std::bad_alloc>;

/// A ServiceError, or std::bad_alloc for want of memory for its text.
inline Failure serviceError(ServiceError::Kind kind, std::string_view what) noexcept {
  try {
    return ServiceError(kind, std::string(what));
  } catch (const std::bad_alloc& error) {
    return error;
  }
}

/// One message on its way to one outcome. Belongs to one channel at a time, on one thread.
class Request {
 public:
  Request(std::string_view outputType, Data message, Clock::duration deadline) noexcept
      : outputType_(outputType), message_(std::move(message)), deadline_(deadline) {}
  Request(const Request&) = delete;
  Request& operator=(const Request&) = delete;
  virtual ~Request() = default;

  /// A record type's schemaName.
  [[nodiscard]] std::string_view outputType() const noexcept { return outputType_; }
  [[nodiscard]] const Data& message() const noexcept { return message_; }
  [[nodiscard]] Clock::duration deadline() const noexcept { return deadline_; }

  /// It has lost a process, and is to be alone in the next one.
  [[nodiscard]] bool isRetried() const noexcept { return losses_ > 0; }

  /// Takes the outcome out of a reply; returns the failure, or null for a record. Throws
  /// frames::RecordError or frames::FrameError when no service sends such a reply: the request is
  /// then still without an outcome.
  virtual const Failure* resolve(const frames::Reply& reply) = 0;
  virtual void fail(Failure failure) noexcept = 0;
  /// Hands the outcome to whoever waits for it. Called once, by the owner of the channel.
  virtual void deliver() noexcept = 0;

 private:
  friend class Channel;
  friend class RequestList;

  const std::string_view outputType_;
  const Data message_;
  const Clock::duration deadline_;

  std::shared_ptr<Request> next_;  // in a RequestList

  // The channel's notes.
  std::uint64_t id_ = 0;     // in the frames of its present try
  TimePoint due_{};          // when its deadline ends; none while it waits for others
  std::uint8_t losses_ = 0;  // processes lost while it was in flight, up to 2
  bool cancelled_ = false;
};

/// Requests in order. Takes no memory, so that no request is ever lost for want of it.
class RequestList {
 public:
  RequestList() noexcept = default;
  RequestList(RequestList&& other) noexcept { append(std::move(other)); }
  RequestList& operator=(RequestList&&) = delete;
  ~RequestList() {
    while (pop() != nullptr) {
    }
  }

  [[nodiscard]] bool empty() const noexcept { return first_ == nullptr; }
  [[nodiscard]] Request* front() const noexcept { return first_.get(); }
  [[nodiscard]] static Request* after(const Request& request) noexcept {
    return request.next_.get();
  }
  void push(std::shared_ptr<Request> request) noexcept {
    Request* const added = request.get();
    (last_ == nullptr ? first_ : last_->next_) = std::move(request);
    last_ = added;
  }
  /// The first request, taken out, or null.
  std::shared_ptr<Request> pop() noexcept {
    std::shared_ptr<Request> request = std::move(first_);
    if (request != nullptr) first_ = std::move(request->next_);
    if (first_ == nullptr) last_ = nullptr;
    return request;
  }
  /// Takes out a request that is in the list.
  std::shared_ptr<Request> remove(Request& request) noexcept {
    RequestList before;
    while (first_.get() != &request) before.push(pop());
    std::shared_ptr<Request> removed = pop();
    before.append(std::move(*this));
    append(std::move(before));
    return removed;
  }
  void append(RequestList&& other) noexcept {
    if (other.first_ == nullptr) return;
    (last_ == nullptr ? first_ : last_->next_) = std::move(other.first_);
    last_ = std::exchange(other.last_, nullptr);
  }
  void deliverAll() noexcept {
    while (const std::shared_ptr<Request> request = pop()) request->deliver();
  }

 private:
  std::shared_ptr<Request> first_;
  Request* last_ = nullptr;
};

}  // namespace ironmoat::client
