#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <exception>
#include <string_view>
#include <utility>

#include "frames/frame.h"
#include "ironmoat/values.h"

namespace ironmoat::client {

/// One message on its way to one outcome: `resolve` or `fail` takes effect once. Shared by who
/// brings the outcome and who waits for it; what the outcome is, is the latter's once `isDone`.
class Request {
 public:
  Request(std::string_view outputType, Data message)
      : outputType_(outputType), message_(std::move(message)) {}
  Request(const Request&) = delete;
  Request& operator=(const Request&) = delete;
  virtual ~Request() = default;

  [[nodiscard]] std::string_view outputType() const noexcept { return outputType_; }
  [[nodiscard]] const Data& message() const noexcept { return message_; }

  /// Bytes that it takes up until its outcome: the message, and about what comes with it.
  [[nodiscard]] std::size_t cost() const noexcept { return message_.size() + 512; }

  /// Gives the outcome that `reply` carries. Throws frames::RecordError or frames::FrameError, with
  /// no outcome given, when the reply is not what a service would send.
  void resolve(const frames::Reply& reply) {
    give(reply);
    done_.store(true, std::memory_order_release);
  }
  void fail(std::exception_ptr error) noexcept {
    giveError(std::move(error));
    done_.store(true, std::memory_order_release);
  }
  [[nodiscard]] bool isDone() const noexcept { return done_.load(std::memory_order_acquire); }

  /// Who sleeps until it is done or there is something for him to do, if anybody does. Under the
  /// mutex of the connection.
  std::condition_variable* sleeper = nullptr;

 protected:
  virtual void give(const frames::Reply& reply) = 0;
  virtual void giveError(std::exception_ptr error) noexcept = 0;

 private:
  std::string_view outputType_;  // a record type's schemaName
  Data message_;
  std::atomic<bool> done_ = false;
};

}  // namespace ironmoat::client
