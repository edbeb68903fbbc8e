#include "ironmoat/client.h"

#include <exception>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <utility>

#include "client/connection.h"
#include "client/default_program.h"
#include "frames/record_codec.h"
#include "ironmoat/command_response.h"
#include "ironmoat/limits.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "values/host_rejection.h"

namespace ironmoat {

namespace {

template <MessageSchema R>
class RequestFor final : public client::Request {
 public:
  explicit RequestFor(const Data& message) : Request(R::schemaName, message) {}

  /// The outcome, once; requires that there is one.
  R take() {
    if (error_ != nullptr) std::rethrow_exception(std::move(error_));
    return *std::move(record_);
  }

 protected:
  void giveError(std::exception_ptr error) noexcept override { error_ = std::move(error); }
  void give(const frames::Reply& reply) override {
    switch (reply.status) {
      case frames::Status::record:
        return giveRecord(reply.body);
      case frames::Status::refused:
        return giveError(std::make_exception_ptr(frames::parseRefusal(reply.body)));
      case frames::Status::notServed:
      case frames::Status::failed:
        return giveError(std::make_exception_ptr(
            ServiceError(ServiceError::Kind::unavailable, frames::parseSentence(reply.body))));
    }
    throw frames::FrameError("a reply of unknown status");
  }

 private:
  void giveRecord(const Data& body) {
    try {
      withHostRejections([&] { record_.emplace(InPlace{body}); });
    } catch (const frames::RecordError&) {
      throw;
    } catch (...) {  // a DecodingError, or std::bad_alloc
      giveError(std::current_exception());
    }
  }

  /// Becomes the record where that is to stand, which spares the largest one a move of 2 KB.
  struct InPlace {
    const Data& body;
    operator R() const { return frames::decodeRecord<R>(body); }  // NOLINT(*-explicit-*)
  };

  std::optional<R> record_;
  std::exception_ptr error_;
};

}  // namespace

Client::Client() : Client(Options()) {}

Client::Client(Options options) {
  if (options.program.empty()) options.program = client::defaultProgram();
  connection_ = std::make_shared<client::Connection>(std::move(options));
}

Client::~Client() {
  if (connection_->inForkedChild()) {
    // Everything that its end would do acts on the parent's service: it is never to end.
    static_cast<void>(new (std::nothrow) std::shared_ptr(connection_));
  } else {
    connection_->stop();
  }
}

template <MessageSchema R>
Pending<R> Client::start(const Data& message, bool waits) {
  using Then = client::Connection::Then;
  auto request = std::make_shared<RequestFor<R>>(message);
  Pending<R> outcome(request, connection_);
  if (message.size() > limits::messageBytes) {
    request->fail(std::make_exception_ptr(
        DecodingError(DecodingError::Kind::limitExceeded, "",
                      "message of " + std::to_string(message.size()) + " bytes, more than " +
                          std::to_string(limits::messageBytes))));
  } else {
    connection_->submit(std::move(request), waits ? Then::waits : Then::returns);
  }
  return outcome;
}

template <MessageSchema R>
std::future_status Pending<R>::waitUntil(Clock::time_point until) const {
  return request_->isDone() || connection_->await(*request_, until) ? std::future_status::ready
                                                                    : std::future_status::timeout;
}

template <MessageSchema R>
R Pending<R>::get() {
  wait();
  connection_.reset();
  const std::shared_ptr<client::Request> request = std::move(request_);
  return static_cast<RequestFor<R>&>(*request).take();
}

// Two lines for each record that the service serves.
template Pending<VeskCommandResponse> Client::start(const Data&, bool);
template Pending<VeskCommandWebTunnelResponse> Client::start(const Data&, bool);
template Pending<DrelUserPayload> Client::start(const Data&, bool);
template class Pending<VeskCommandResponse>;
template class Pending<VeskCommandWebTunnelResponse>;
template class Pending<DrelUserPayload>;

}  // namespace ironmoat
