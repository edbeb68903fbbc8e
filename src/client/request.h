#pragma once

#include <cstddef>
#include <exception>
#include <string_view>
#include <utility>

#include "frames/frame.h"
#include "ironmoat/values.h"

namespace ironmoat::client {

/// One message on its way to one outcome: `resolve` or `fail` takes effect once.
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
    resolved_ = true;
  }
  [[nodiscard]] bool isResolved() const noexcept { return resolved_; }
  virtual void fail(std::exception_ptr error) noexcept = 0;

 protected:
  virtual void give(const frames::Reply& reply) = 0;

 private:
  std::string_view outputType_;  // a record type's schemaName
  Data message_;
  bool resolved_ = false;
};

}  // namespace ironmoat::client
