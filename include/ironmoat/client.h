#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>

#include "ironmoat/api.h"
#include "ironmoat/client_options.h"
#include "ironmoat/errors.h"
#include "ironmoat/message_schema.h"
#include "ironmoat/outcome.h"
#include "ironmoat/pending.h"
#include "ironmoat/stats.h"
#include "ironmoat/values.h"

namespace ironmoat {

/// Hands messages to service processes and gets records back. Thread-safe; one client serves all
/// threads of a daemon. For a daemon with an event loop there is EventLoopClient.
///
/// `R` is VeskCommandResponse, VeskCommandWebTunnelResponse or DrelUserPayload. Each request has
/// exactly one outcome: a record, DecodingError (the message was rejected), ServiceError (the
/// service gave no answer) or std::bad_alloc. A process that dies under a request is replaced and
/// the request is sent once more; the message that is at fault fails, every other one gets its
/// record.
///
/// Processes are started when they are needed, the constructor starts none; a missing service is
/// `unavailable`. The client changes no signal's handling. The daemon gets a SIGCHLD when a process
/// ends; a handler that reaps it does no harm. No call is a point of cancellation. After fork() the
/// client belongs to the parent: in the child every request fails with `unavailable`, and
/// destroying the copy does nothing.
class IRONMOAT_API Client {
 public:
  using Options = ClientOptions;
  /// A request's own deadline, instead of ClientOptions::deadline.
  using Deadline = std::optional<std::chrono::milliseconds>;

  explicit Client(Options options = {});
  Client(const Client&) = delete;
  Client& operator=(const Client&) = delete;
  /// Submitted requests without an outcome fail with `unavailable`. No other call may be under way.
  /// Leaves no process, thread or descriptor behind.
  ~Client();

  /// The record; throws what the outcome is otherwise. Works on the calling thread, with a process
  /// of its own; waits its turn, first come first served, while all processes are in use.
  template <MessageSchema R>
  R unpack(const Data& message, Deadline deadline = {});
  /// The same without exceptions for what comes of the message.
  template <MessageSchema R>
  Outcome<R> tryUnpack(const Data& message, Deadline deadline = {});

  /// Returns before there is an outcome. The client's one thread, started by the first call, sends
  /// what was submitted and receives the replies. Waits while ClientOptions::maxBytesInFlight are
  /// in flight. `message` is shared, not copied.
  template <MessageSchema R>
  [[nodiscard]] Pending<R> submit(const Data& message, Deadline deadline = {});
  /// Calls `completion` on the client's thread. It must not throw, wait for another outcome or
  /// destroy the client. It may submit, which does not wait there; but after `unavailable` it
  /// should not at once, since that is also what the end of the client gives.
  template <MessageSchema R>
  void submit(const Data& message, std::function<void(Outcome<R>)> completion,
              Deadline deadline = {});

  [[nodiscard]] Stats stats() const noexcept;

 private:
  std::shared_ptr<client::Core> core_;
};

}  // namespace ironmoat
