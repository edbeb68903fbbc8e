#include "ironmoat/client.h"

#include <new>
#include <optional>
#include <utility>

#include "client/connection.h"
#include "client/default_program.h"
#include "frames/record_codec.h"
#include "ironmoat/command_response.h"
#include "ironmoat/limits.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat {

namespace {

template <MessageSchema R>
class RequestFor final : public client::Request {
 public:
  explicit RequestFor(const Data& message) : Request(R::schemaName, message) {}
  RequestFor(const RequestFor&) = delete;
  RequestFor& operator=(const RequestFor&) = delete;
  /// Only for want of memory is a request dropped that has no outcome. The promise would break
  /// then, and make the error for that of memory that there may not be.
  ~RequestFor() override {
    if (!done_) fail(std::make_exception_ptr(std::bad_alloc()));
  }

  [[nodiscard]] std::future<R> outcome() { return promise_.get_future(); }
  void fail(std::exception_ptr error) noexcept override {
    done_ = true;
    promise_.set_exception(std::move(error));
  }

 protected:
  void give(const frames::Reply& reply) override {
    switch (reply.status) {
      case frames::Status::record:
        return giveRecord(reply.body);
      case frames::Status::refused:
        return fail(std::make_exception_ptr(frames::parseRefusal(reply.body)));
      case frames::Status::notServed:
      case frames::Status::failed:
        return fail(std::make_exception_ptr(
            ServiceError(ServiceError::Kind::unavailable, frames::parseSentence(reply.body))));
    }
    throw frames::FrameError("a reply of unknown status");
  }

 private:
  void giveRecord(const Data& body) {
    std::optional<R> record;
    try {
      record.emplace(frames::decodeRecord<R>(body));
    } catch (const frames::RecordError&) {
      throw;
    } catch (const std::bad_alloc&) {
      return fail(std::current_exception());
    } catch (const std::exception& refusal) {  // of the record's initialiser
      return fail(
          std::make_exception_ptr(ServiceError(ServiceError::Kind::unavailable, refusal.what())));
    }
    done_ = true;
    promise_.set_value(std::move(*record));
  }

  std::promise<R> promise_;
  bool done_ = false;
};

}  // namespace

Client::Client() : Client(Options()) {}

Client::Client(Options options) {
  if (options.program.empty()) options.program = client::defaultProgram();
  connection_ = std::make_unique<client::Connection>(std::move(options));
}

Client::~Client() {
  // Everything below would act on the parent's service.
  if (connection_->inForkedChild()) static_cast<void>(connection_.release());
}

template <MessageSchema R>
std::future<R> Client::start(const Data& message, bool waits) {
  using Then = client::Connection::Then;
  auto request = std::make_unique<RequestFor<R>>(message);
  std::future<R> outcome = request->outcome();
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

// One line for each record that the service serves.
template std::future<VeskCommandResponse> Client::start(const Data&, bool);
template std::future<VeskCommandWebTunnelResponse> Client::start(const Data&, bool);
template std::future<DrelUserPayload> Client::start(const Data&, bool);

}  // namespace ironmoat
