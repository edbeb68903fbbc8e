#pragma once

#include <chrono>

#include "ironmoat/client_options.h"

namespace ironmoat::client {

/// The options with every value in its range, and `program` and `processes` filled in.
ClientOptions settingsFrom(ClientOptions options);

/// A deadline from 1 ms to a day; others become the nearest.
std::chrono::milliseconds validDeadline(std::chrono::milliseconds deadline) noexcept;

}  // namespace ironmoat::client
