#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>

#include "ironmoat/api.h"
#include "ironmoat/client_options.h"
#include "ironmoat/message_schema.h"
#include "ironmoat/outcome.h"
#include "ironmoat/stats.h"
#include "ironmoat/values.h"

namespace ironmoat {

namespace client {
class Request;
}

/// The client for a daemon with an event loop of its own: no thread, completions on the thread that
/// calls `dispatch`. Blocks only after the loss of a process, for its exit status: microseconds as
/// a rule, at most 100 ms, or a second if the process cannot be killed.
///
///     loop:
///       poll `fd()` for reading, for at most `timeout()`
///       call `dispatch()`
///
/// `timeout` changes with every call of `submit`, `cancel` and `dispatch`: ask again before each
/// wait. Outcomes, retries and processes are as Client's; ClientOptions::maxBytesInFlight is the
/// daemon's own to keep (`stats().bytesInFlight`). Used by one thread at a time. The constructor
/// throws std::system_error when it gets no descriptor. After fork() it belongs to the parent: in
/// the child it does nothing, and completions fail with `unavailable`.
class IRONMOAT_API EventLoopClient {
 public:
  using Options = ClientOptions;
  using Deadline = std::optional<std::chrono::milliseconds>;

  /// Names a request for `cancel`; may outlive it and the client.
  class Handle {
   public:
    Handle() noexcept = default;

   private:
    friend class EventLoopClient;
    std::weak_ptr<client::Request> request_;
  };

  explicit EventLoopClient(Options options = {});
  EventLoopClient(const EventLoopClient&) = delete;
  EventLoopClient& operator=(const EventLoopClient&) = delete;
  /// Requests without an outcome are dropped, their completions are not called. Leaves no process
  /// and no descriptor behind.
  ~EventLoopClient();

  /// Readable when `dispatch` has something to do. The same descriptor for the client's whole life;
  /// it works with poll, epoll and what is built on them.
  [[nodiscard]] int fd() const noexcept;
  /// After how many milliseconds `dispatch` has something to do at the latest; -1: never by time.
  [[nodiscard]] int timeout() const noexcept;
  /// Sends, receives, starts and replaces processes, looks at deadlines, then calls the completions
  /// of the requests that got their outcome. These must not throw; they may call anything of this
  /// client but `dispatch`, and not destroy it.
  void dispatch();

  /// Nothing is sent before the next `dispatch`, so that many requests go out together. `message`
  /// is shared, not copied. Throws std::bad_alloc.
  template <MessageSchema R>
  Handle submit(const Data& message, std::function<void(Outcome<R>)> completion,
                Deadline deadline = {});
  /// Drops the request: its completion will not be called. False if it was called before, or
  /// dropped.
  bool cancel(const Handle& handle);

  [[nodiscard]] Stats stats() const noexcept;

 private:
  struct Core;
  std::unique_ptr<Core> core_;
};

}  // namespace ironmoat
