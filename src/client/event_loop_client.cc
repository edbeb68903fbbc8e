#include "ironmoat/event_loop_client.h"

#include <algorithm>
#include <utility>

#include "client/early_failure.h"
#include "client/engine.h"
#include "client/fork_mark.h"
#include "client/record_request.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat {

using client::Clock;
using client::Request;
using client::RequestList;
using client::TimePoint;

struct EventLoopClient::Core {
  explicit Core(Options options) : settings(std::move(options)), engine(settings, counters) {
    forkMark.set();
  }

  const client::Settings settings;
  client::Counters counters;
  client::ForkMark forkMark;
  client::Engine engine;
  RequestList finished;  // to be delivered by the next dispatch
};

namespace {

/// A request whose completion can be taken away.
class LoopRequest : public Request {
 public:
  using Request::Request;
  /// Returns whether it was there: neither called, nor being called, nor dropped.
  virtual bool dropCompletion() noexcept = 0;
};

template <MessageSchema R>
class LoopRequestFor final : public client::RecordRequest<R, LoopRequest> {
 public:
  LoopRequestFor(const Data& message, Clock::duration deadline, client::Counters& counters,
                 std::function<void(Outcome<R>)> completion)
      : client::RecordRequest<R, LoopRequest>(message, deadline),
        counted_(counters, message.size()),
        completion_(std::move(completion)) {}
  void deliver() noexcept override {
    if (const auto completion = std::exchange(completion_, nullptr)) completion(this->take());
  }
  bool dropCompletion() noexcept override { return std::exchange(completion_, nullptr) != nullptr; }

 private:
  const client::InFlight counted_;
  std::function<void(Outcome<R>)> completion_;
};

}  // namespace

EventLoopClient::EventLoopClient(Options options)
    : core_(std::make_unique<Core>(std::move(options))) {}

EventLoopClient::~EventLoopClient() {
  // In a forked child everything that its end would do acts on the parent's processes.
  if (core_->forkMark.inCopy()) static_cast<void>(core_.release());
}

int EventLoopClient::fd() const noexcept { return core_->engine.fd(); }

int EventLoopClient::timeout() const noexcept {
  if (!core_->finished.empty()) return 0;
  return client::millisecondsUntil(core_->engine.wakeAt());
}

void EventLoopClient::dispatch() {
  if (!core_->forkMark.inCopy()) {
    core_->engine.wait(0);
    core_->engine.step();
    core_->finished.append(std::move(core_->engine.finished()));
  }
  RequestList finished(std::move(core_->finished));
  finished.deliverAll();
}

template <MessageSchema R>
EventLoopClient::Handle EventLoopClient::submit(const Data& message,
                                                std::function<void(Outcome<R>)> completion,
                                                Deadline deadline) {
  const auto request = std::make_shared<LoopRequestFor<R>>(
      message, deadline ? client::validDeadline(*deadline) : core_->settings.deadline,
      core_->counters, std::move(completion));
  if (client::failsEarly(*request, core_->forkMark, core_->counters)) {
    core_->finished.push(request);
  } else {
    core_->engine.add(request);
  }
  Handle handle;
  handle.request_ = request;
  return handle;
}

bool EventLoopClient::cancel(const Handle& handle) {
  const auto request = std::static_pointer_cast<LoopRequest>(handle.request_.lock());
  if (request == nullptr || !request->dropCompletion()) return false;
  if (!core_->forkMark.inCopy()) core_->engine.cancel(*request);
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
