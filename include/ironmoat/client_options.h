#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>

namespace ironmoat {

/// For Client and EventLoopClient.
struct ClientOptions {
  /// Path of the service's executable, started with an empty environment. Empty: the service that
  /// was installed with this library. The static library looks where it was configured to be
  /// installed; the shared one first in its own installation, wherever that was moved to, if only
  /// root and this process's user can change what is there.
  std::string program;

  /// How long the service may work on one message, from 1 ms to a day (others become the nearest).
  /// A message that had the process to itself then fails with `timedOut`. One that shared it is
  /// sent again, alone, with a deadline of its own. Waiting for a process does not count.
  std::chrono::milliseconds deadline{2000};

  /// Service processes at most, each of which works on one message at a time. 0: one for each
  /// processor, 4 at most. The first is started with the first message, another only while all are
  /// busy. A `Client` whose `unpack` and `submit` are both used has so many for each.
  std::size_t processes = 0;

  /// A process that has been idle for so long is ended, but for the last one. Looked at whenever a
  /// call ends: a client that is not used does nothing.
  std::chrono::milliseconds idleTime{30'000};

  /// A process is replaced between two requests once it has answered so many or has lived so long:
  /// a process that a message has taken over does not see messages forever. A start takes 2 ms, so
  /// that these values cost less than a thousandth of a processor.
  std::uint64_t requestsPerProcess = 1'000'000;
  std::chrono::seconds processLifetime{600};

  /// Bytes of submitted messages without an outcome, with some 500 more for each. `submit` waits
  /// for room, in the order of the calls; a message that is larger goes alone. Records are not
  /// counted: a message of 28 KB can become one of 64 MiB (limits.h), so that it is the number of
  /// outcomes held that bounds the daemon's memory.
  std::size_t maxBytesInFlight = std::size_t{64} << 20;
};

}  // namespace ironmoat
