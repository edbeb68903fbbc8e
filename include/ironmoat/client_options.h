#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

namespace ironmoat {

/// For Client and EventLoopClient.
struct ClientOptions {
  /// Path of the service's executable, started with an empty environment. Empty: the service that
  /// was installed with this library. The static library looks where it was configured to be
  /// installed; the shared one first in its own installation, wherever that was moved to, if only
  /// root and this process's user can change what is there.
  std::string program{};

  /// How long the service may work on one message, from 1 ms to a day (others become the nearest).
  /// A message that had the process to itself then fails with `timedOut`. One that shared it is
  /// sent again, alone, with a deadline of its own. Waiting for a process does not count.
  std::chrono::milliseconds deadline{2000};

  /// The largest number of service processes, each of which works on one message at a time. 0: one
  /// for each processor, at most 4. The client starts the first one with the first message, another
  /// only while all are busy. If `unpack` and `submit` of one Client are both used, each has so
  /// many.
  std::size_t processes = 0;

  /// The client ends a process that has been idle for so long, except the last one. It checks this
  /// when a call ends: a client that is not used does nothing.
  std::chrono::milliseconds idleTime{30'000};

  /// The client replaces a process between two requests once it has answered so many, or has run
  /// for so long, so that a compromised process does not see messages forever. A start takes about
  /// 2 ms: the defaults cost less than a thousandth of a processor.
  std::uint64_t requestsPerProcess = 1'000'000;
  std::chrono::seconds processLifetime{600};

  /// The largest total size in bytes of submitted messages without an outcome, about 500 bytes
  /// added for each. `submit` blocks while its message would exceed it, first come first served; a
  /// message that is larger by itself goes alone.
  std::size_t maxBytesInFlight = std::size_t{64} << 20;

  /// The largest total size in bytes of records that were received and not yet taken: from their
  /// Pending, or by their completion. A message of 155 KB can become a record of 64 MiB (limits.h).
  /// A record that would exceed it becomes std::bad_alloc, unless it is the only one.
  std::size_t maxBytesHeld = std::size_t{1} << 30;

  /// Called with the reason when a process is lost, such as "was killed by SIGSEGV", on the thread
  /// that noticed it: for a log. The requests that it had are sent again or fail. Must not throw,
  /// block or use the client.
  std::function<void(std::string_view)> onProcessLost{};
};

}  // namespace ironmoat
