#pragma once

/// What the service process does about its memory, all of which belongs to one thread.
namespace ironmoat::confinement {

/// Sets what malloc keeps, and grows the stack to the size that the deepest message needs. Before
/// the address space is limited: a stack that has to grow at the limit would be a crash.
void prepareMemory() noexcept;

/// Returns what malloc keeps for messages to come to the kernel.
void releaseMemory() noexcept;

/// The same, and overwrites what is left: no text of an earlier message stays in free memory or
/// below the caller's stack frame. Takes some tens of microseconds.
void wipeAndReleaseMemory() noexcept;

}  // namespace ironmoat::confinement
