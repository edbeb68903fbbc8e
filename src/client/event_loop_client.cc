#include "ironmoat/event_loop_client.h"

#include <memory>
#include <utility>

#include "client/context.h"
#include "client/engine.h"
#include "client/record_request.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat {

using client::RecordRequest;
using client::Request;

struct EventLoopClient::Core : client::Context {
  using Context::Context;
  client::Engine engine{*this};
  client::RequestList finished;  // their completions are called by the next dispatch
};

EventLoopClient::EventLoopClient(Options options)
    : core_(std::make_unique<Core>(std::move(options))) {}

EventLoopClient::~EventLoopClient() {
  // In a forked child everything that its end would do acts on the parent's processes.
  if (core_->forkMark.isCopy()) static_cast<void>(core_.release());
}

int EventLoopClient::fd() const noexcept { return core_->engine.fd(); }

int EventLoopClient::timeout() const noexcept {
  if (!core_->finished.empty()) return 0;
  return core_->forkMark.isCopy() ? -1 : client::millisecondsUntil(core_->engine.wakeAt());
}

void EventLoopClient::dispatch() {
  if (!core_->forkMark.isCopy()) {
    core_->engine.step(core_->engine.wait(0));
    append(core_->finished, core_->engine.finished());
  }
  deliverAll(std::move(core_->finished));
}

template <MessageSchema R>
EventLoopClient::Handle EventLoopClient::submit(const Data& message,
                                                std::function<void(Outcome<R>)> completion,
                                                Deadline deadline) {
  const auto request = std::make_shared<RecordRequest<R>>(
      core_->counters, message, core_->deadline(deadline), std::move(completion));
  client::RequestList one{request};
  if (core_->failsEarly(*request)) {
    append(core_->finished, one);
  } else {
    core_->engine.add(std::move(one));
  }
  Handle handle;
  handle.request_ = request;
  return handle;
}

bool EventLoopClient::cancel(const Handle& handle) {
  const std::shared_ptr<Request> request = handle.request_.lock();
  if (request == nullptr || !request->hasCompletion()) return false;
  request->cancel();
  return true;
}

Stats EventLoopClient::stats() const noexcept { return core_->counters.snapshot(); }

template EventLoopClient::Handle EventLoopClient::submit(
    const Data&, std::function<void(Outcome<VeskCommandResponse>)>, Deadline);
template EventLoopClient::Handle EventLoopClient::submit(
    const Data&, std::function<void(Outcome<VeskCommandWebTunnelResponse>)>, Deadline);
template EventLoopClient::Handle EventLoopClient::submit(
    const Data&, std::function<void(Outcome<DrelUserPayload>)>, Deadline);

}  // namespace ironmoat
