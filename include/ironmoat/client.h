#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <string>

#include "ironmoat/api.h"
#include "ironmoat/errors.h"
#include "ironmoat/message_schema.h"
#include "ironmoat/pending.h"
#include "ironmoat/values.h"

namespace ironmoat {

/// Hands messages to a service process of its own and gets records back.
///
/// The process is started on first use and again whenever it is gone; it ends with the client. When
/// it dies or hangs, the messages it had been given are tried again one at a time on a fresh one:
/// the message that is at fault fails, every other one gets its record. Each request has exactly
/// one outcome.
///
/// Any number of threads may use one client at once, with any number of requests in flight. The
/// client keeps one thread, which takes none of the daemon's signals, and changes no signal's
/// handling; a SIGCHLD comes when its process ends, and a handler that reaps it does no harm. No
/// call is a point of cancellation. After fork() a client that was used belongs to the parent: in
/// the child every request fails with `unavailable`, and destroying the copy does nothing.
class IRONMOAT_API Client {
 public:
  struct Options {
    /// Path of the service's executable, started with an empty environment. Empty: the service that
    /// was installed with this library. The static library looks where it was configured to be
    /// installed; the shared one first in its own installation, wherever that was moved to, when
    /// nobody but root and this process's user can change what is there.
    std::string program;
    /// How long the service may work on one message, from 1 ms to a day (others are taken as the
    /// nearest). A request that is past it is tried again, alone, and a second time when another
    /// had been served before it, before it fails with `timedOut`; waiting for other requests does
    /// not count.
    std::chrono::milliseconds deadline{2000};
    /// Bytes of requests without an outcome, with some 500 more for each request. `submit` and
    /// `unpack` wait for room, in the order of the calls; a message that is larger goes alone.
    /// Records are not counted: a message of 28 KB can become one of 64 MiB (limits.h), so that it
    /// is the number of outcomes held that bounds the daemon's memory.
    std::size_t maxBytesInFlight = std::size_t{64} << 20;
  };

  Client();
  explicit Client(Options options);
  Client(const Client&) = delete;
  Client& operator=(const Client&) = delete;
  /// Requests still in flight fail with ServiceError `unavailable`. Leaves no process, thread or
  /// descriptor behind.
  ~Client();

  /// Waits for the record: R is VeskCommandResponse, VeskCommandWebTunnelResponse or
  /// DrelUserPayload. Throws DecodingError when the message is refused, ServiceError when no answer
  /// could be had, std::bad_alloc. The constructor does not look for the service: a missing one is
  /// `unavailable` here.
  template <MessageSchema R>
  R unpack(const Data& message) {
    return start<R>(message, true).get();
  }

  /// The same without waiting for the outcome, whose `get` throws what `unpack` would. `message` is
  /// shared, not copied. Records wait in their outcomes, in the memory of whoever holds these.
  template <MessageSchema R>
  Pending<R> submit(const Data& message) {
    return start<R>(message, false);
  }

 private:
  template <MessageSchema R>
  Pending<R> start(const Data& message, bool waits);

  std::shared_ptr<client::Connection> connection_;
};

}  // namespace ironmoat
