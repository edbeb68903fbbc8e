#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>

#include "client/request.h"
#include "ironmoat/client_options.h"

namespace ironmoat::client {

/// `ClientOptions`, every value in its range and `program` filled in.
struct Settings {
  explicit Settings(ClientOptions options);

  std::string program;
  Clock::duration deadline;
  std::size_t processes;
  Clock::duration idleTime;
  std::uint64_t requestsPerProcess;
  Clock::duration processLifetime;
  std::size_t maxBytesInFlight;
};

/// A deadline from 1 ms to a day; others become the nearest.
Clock::duration validDeadline(std::chrono::milliseconds deadline) noexcept;

}  // namespace ironmoat::client
