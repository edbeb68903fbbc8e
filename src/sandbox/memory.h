#pragma once

/// The memory of the service process. Not thread-safe: the process has one thread.
namespace ironmoat::sandbox {

/// Configures malloc and grows the stack to the size that the deepest message needs. Must be called
/// before the address space is limited: a stack that cannot grow is a crash.
void prepareMemory() noexcept;

/// Returns the free memory that malloc keeps to the kernel.
void releaseMemory() noexcept;

/// Overwrites all free memory and the stack below the caller's frame, so that no part of an earlier
/// message remains, and returns free memory to the kernel. Takes tens of microseconds.
void wipeAndReleaseMemory() noexcept;

}  // namespace ironmoat::sandbox
