#include "ironmoat/client.h"

#include <pthread.h>

#include <memory>
#include <new>
#include <string>
#include <system_error>
#include <utility>

#include "client/core.h"
#include "client/early_failure.h"
#include "client/record_request.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat {

namespace {

using client::Core;
using client::RecordRequest;
using client::Request;
using client::SubmittedRequest;

/// A call on the stack of the thread that makes it.
class Call : public Request {
 public:
  using Request::Request;
  void deliver() noexcept override {}
};

template <MessageSchema R>
class CompletedRequest final : public RecordRequest<R, SubmittedRequest> {
 public:
  CompletedRequest(const Data& message, client::Clock::duration deadline,
                   std::function<void(Outcome<R>)> completion)
      : RecordRequest<R, SubmittedRequest>(message, deadline, true),
        completion_(std::move(completion)) {}
  void deliver() noexcept override { completion_(this->take()); }

 private:
  std::function<void(Outcome<R>)> completion_;
};

/// The calling thread is not cancelled while it has what others wait for.
class Uncancelled {
 public:
  Uncancelled() noexcept { ::pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &before_); }
  Uncancelled(const Uncancelled&) = delete;
  Uncancelled& operator=(const Uncancelled&) = delete;
  ~Uncancelled() { ::pthread_setcancelstate(before_, nullptr); }

 private:
  int before_ = 0;
};

client::Clock::duration deadlineOf(const Core& core, Client::Deadline own) noexcept {
  return own ? client::validDeadline(*own) : core.settings.deadline;
}

void run(Core& core, Request& request) {
  if (failsEarly(request, core.forkMark, core.counters)) return;
  const Uncancelled whole;
  const client::InFlight counted(core.counters, request.message().size());
  core.pool.run(std::shared_ptr<Request>(std::shared_ptr<void>(), &request));
}

void submitTo(Core& core, const std::shared_ptr<SubmittedRequest>& request) {
  const Uncancelled whole;
  try {
    if (!failsEarly(*request, core.forkMark, core.counters)) return core.engine.submit(request);
  } catch (const std::system_error& error) {
    request->fail(ServiceError(ServiceError::Kind::unavailable,
                               std::string("cannot start the client's thread: ") + error.what()));
  }
  client::SharedEngine::complete(*request);
}

}  // namespace

Client::Client(Options options) : core_(std::make_shared<Core>(std::move(options))) {}

Client::~Client() {
  if (core_->forkMark.inCopy()) {
    // Everything that its end would do acts on the parent's processes: it is never to end.
    static_cast<void>(new (std::nothrow) std::shared_ptr(core_));
  } else {
    const Uncancelled whole;
    core_->engine.stop();
    core_->pool.end();
  }
}

template <MessageSchema R>
R Client::unpack(const Data& message, Deadline deadline) {
  RecordRequest<R, Call> request(message, deadlineOf(*core_, deadline));
  run(*core_, request);
  return request.takeRecord();
}

template <MessageSchema R>
Outcome<R> Client::tryUnpack(const Data& message, Deadline deadline) {
  try {
    RecordRequest<R, Call> request(message, deadlineOf(*core_, deadline));
    run(*core_, request);
    return request.take();
  } catch (const std::bad_alloc& error) {
    return Outcome<R>(error);
  }
}

template <MessageSchema R>
Pending<R> Client::submit(const Data& message, Deadline deadline) {
  auto request =
      std::make_shared<RecordRequest<R, SubmittedRequest>>(message, deadlineOf(*core_, deadline));
  submitTo(*core_, request);
  return Pending<R>(std::move(request), core_);
}

template <MessageSchema R>
void Client::submit(const Data& message, std::function<void(Outcome<R>)> completion,
                    Deadline deadline) {
  submitTo(*core_, std::make_shared<CompletedRequest<R>>(message, deadlineOf(*core_, deadline),
                                                         std::move(completion)));
}

Stats Client::stats() const noexcept {
  Stats stats = core_->counters.snapshot();
  if (!core_->forkMark.inCopy()) core_->engine.addTo(stats);
  return stats;
}

template <MessageSchema R>
std::future_status Pending<R>::waitUntil(Clock::time_point until) const {
  if (request_->isDone()) return std::future_status::ready;
  if (core_->forkMark.inCopy()) {
    request_->fail(ServiceError(ServiceError::Kind::unavailable,
                                "this request belongs to the process that forked this one"));
    return std::future_status::ready;
  }
  const Uncancelled whole;
  return core_->engine.await(*request_, until) ? std::future_status::ready
                                               : std::future_status::timeout;
}

template <MessageSchema R>
Outcome<R> Pending<R>::outcome() {
  wait();
  core_.reset();
  const std::shared_ptr<SubmittedRequest> request = std::move(request_);
  return static_cast<RecordRequest<R, SubmittedRequest>&>(*request).take();
}

template <MessageSchema R>
R Pending<R>::get() {
  wait();
  core_.reset();
  const std::shared_ptr<SubmittedRequest> request = std::move(request_);
  return static_cast<RecordRequest<R, SubmittedRequest>&>(*request).takeRecord();
}

#define IRONMOAT_CLIENT_FOR(R)                                                          \
  template R Client::unpack(const Data&, Deadline);                                     \
  template Outcome<R> Client::tryUnpack(const Data&, Deadline);                         \
  template Pending<R> Client::submit(const Data&, Deadline);                            \
  template void Client::submit(const Data&, std::function<void(Outcome<R>)>, Deadline); \
  template class Pending<R>

IRONMOAT_CLIENT_FOR(VeskCommandResponse);
IRONMOAT_CLIENT_FOR(VeskCommandWebTunnelResponse);
IRONMOAT_CLIENT_FOR(DrelUserPayload);

}  // namespace ironmoat
