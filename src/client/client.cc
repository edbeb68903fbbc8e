#include "ironmoat/client.h"

#include <pthread.h>

#include <memory>
#include <new>
#include <utility>

#include "client/context.h"
#include "client/pool.h"
#include "client/record_request.h"
#include "client/shared_engine.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat {

using client::Clock;
using client::RecordRequest;
using client::Request;

/// What the threads that use a Client share.
struct client::Core : Context {
  using Context::Context;
  Pool pool{*this};
  SharedEngine engine{*this};
};

namespace {

using client::Core;

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

/// The request stays the caller's, on its stack.
void run(Core& core, Request& request) {
  const Uncancelled whole;
  if (!core.failsEarly(request)) core.pool.run({std::shared_ptr<void>(), &request});
}

void submitTo(Core& core, const std::shared_ptr<Request>& request) {
  const Uncancelled whole;
  try {
    const bool isDone = core.failsEarly(*request);
    const bool waitsForThread = !isDone || (request->hasCompletion() && !core.forkMark.isCopy());
    if (waitsForThread) return core.engine.submit(request);
  } catch (const ServiceError& error) {
    if (!request->isDone()) request->fail(error);
  }
  request->deliver();
}

}  // namespace

Client::Client(Options options) : core_(std::make_shared<Core>(std::move(options))) {}

Client::~Client() {
  if (core_->forkMark.isCopy()) {
    // Everything that its end would do acts on the parent's processes: it must never end.
    static_cast<void>(new (std::nothrow) std::shared_ptr(core_));
  } else {
    const Uncancelled whole;
    core_->engine.stop();
    core_->pool.end();
  }
}

template <MessageSchema R>
R Client::unpack(const Data& message, Deadline deadline) {
  RecordRequest<R> request(core_->counters, message, core_->deadline(deadline));
  run(*core_, request);
  return request.takeRecord();
}

template <MessageSchema R>
Outcome<R> Client::tryUnpack(const Data& message, Deadline deadline) {
  try {
    RecordRequest<R> request(core_->counters, message, core_->deadline(deadline));
    run(*core_, request);
    return request.take();
  } catch (const std::bad_alloc& error) {
    return Outcome<R>(error);
  }
}

template <MessageSchema R>
Pending<R> Client::submit(const Data& message, Deadline deadline) {
  auto request =
      std::make_shared<RecordRequest<R>>(core_->counters, message, core_->deadline(deadline));
  submitTo(*core_, request);
  return Pending<R>(std::move(request), core_);
}

template <MessageSchema R>
void Client::submit(const Data& message, std::function<void(Outcome<R>)> completion,
                    Deadline deadline) {
  submitTo(*core_, std::make_shared<RecordRequest<R>>(
                       core_->counters, message, core_->deadline(deadline), std::move(completion)));
}

Stats Client::stats() const noexcept { return core_->counters.snapshot(); }

template <MessageSchema R>
Pending<R>::~Pending() {
  if (request_) request_->announceEnd();
}

template <MessageSchema R>
std::future_status Pending<R>::waitUntil(Clock::time_point until) const {
  if (!request_->isDone() && core_->forkMark.isCopy()) {
    request_->fail(ServiceError(ServiceError::Kind::unavailable,
                                "this request belongs to the process that forked this one"));
  }
  const Uncancelled whole;
  return request_->isDone() || core_->engine.await(*request_, until) ? std::future_status::ready
                                                                     : std::future_status::timeout;
}

template <MessageSchema R>
Outcome<R> Pending<R>::outcome() {
  wait();
  const auto request = std::exchange(request_, nullptr);
  return static_cast<RecordRequest<R>&>(*request).take();
}

template <MessageSchema R>
R Pending<R>::get() {
  wait();
  const auto request = std::exchange(request_, nullptr);
  return static_cast<RecordRequest<R>&>(*request).takeRecord();
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
