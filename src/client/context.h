#pragma once

#include <pthread.h>

#include <atomic>
#include <string>
#include <utility>

#include "client/counters.h"
#include "client/request.h"
#include "client/settings.h"
#include "ironmoat/client_options.h"
#include "ironmoat/limits.h"

namespace ironmoat::client {

/// Tells the process that made it from copies that fork() makes of that process.
class ForkMark {
 public:
  [[nodiscard]] bool isCopy() const noexcept { return generation_ != current(); }

 private:
  static unsigned current() noexcept {
    static std::atomic<unsigned> forks = 0;  // between this process and the first one
    static const int registered =
        ::pthread_atfork(nullptr, nullptr, [] { forks.fetch_add(1, std::memory_order_relaxed); });
    static_cast<void>(registered);
    return forks.load(std::memory_order_relaxed);
  }

  unsigned generation_ = current();
};

/// What all parts of one client share.
struct Context {
  explicit Context(ClientOptions options) : settings(settingsFrom(std::move(options))) {}

  const ClientOptions settings;
  Counters counters{settings.maxBytesHeld};
  const ForkMark forkMark;

  [[nodiscard]] Clock::duration deadline(
      std::optional<std::chrono::milliseconds> own) const noexcept {
    return own ? validDeadline(*own) : settings.deadline;
  }

  /// Fails a request that no process is to see: one of a forked child, or with a message over the
  /// limit. Returns whether it did.
  bool failsEarly(Request& request) {
    const std::size_t size = request.message().size();
    if (size > limits::messageBytes) {
      request.fail(DecodingError(DecodingError::Kind::limitExceeded, "",
                                 "message of " + std::to_string(size) +
                                     " bytes exceeds the limit of " +
                                     std::to_string(limits::messageBytes)));
    } else if (forkMark.isCopy()) {
      request.fail(ServiceError(ServiceError::Kind::unavailable,
                                "this client belongs to the process that forked this one"));
    }
    return request.isDone();
  }
};

}  // namespace ironmoat::client
