#pragma once

#include <cstddef>
#include <exception>
#include <string_view>
#include <utility>

#include "frames/frame.h"
#include "ironmoat/values.h"

namespace ironmoat::client {

/// One message on its way to one outcome: either `take` and then `deliver`, or `fail`, once.
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

  /// Takes the outcome that `reply` carries, for `deliver` to give. Throws frames::RecordError or
  /// frames::FrameError, with nothing taken, when the reply is not what a service would send.
  virtual void take(const frames::Reply& reply) = 0;
  [[nodiscard]] virtual bool taken() const noexcept = 0;
  virtual void deliver() noexcept = 0;
  virtual void fail(std::exception_ptr error) noexcept = 0;

 private:
  std::string_view outputType_;  // a record type's schemaName
  Data message_;
};

}  // namespace ironmoat::client
