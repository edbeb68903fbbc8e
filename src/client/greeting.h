#pragma once

#include "frames/frame.h"

namespace ironmoat::client {

/// Throws frames::FrameError unless a service with this hello has this library's limits and every
/// required part of the sandbox.
void requireUsable(const frames::Hello& hello);

/// The service runs in an address space below the one that the limits suppose, so that it may
/// reject a good message for want of memory.
[[nodiscard]] bool hasLimitedMemory(const frames::Hello& hello) noexcept;

}  // namespace ironmoat::client
