#pragma once

#include <cstddef>
#include <cstdint>
#include <system_error>

#include "frames/confinement_bits.h"

/// Takes from a process all that unpacking does not need: to be called before it looks at the first
/// byte that it was sent. Needs no privilege, no file and no namespace, and cannot be undone.
namespace ironmoat::confinement {

/// Bytes of address space for the whole process, whatever number of messages it is working on.
inline constexpr std::size_t kAddressSpace = std::size_t{1} << 30;
/// Threads at work on messages that this is reckoned for.
inline constexpr unsigned kMostThreads = 8;

/// A part of the confinement that cannot be had here; `code()` says why.
class CannotConfine : public std::system_error {
 public:
  CannotConfine(frames::Confinement part, int error);
  [[nodiscard]] frames::Confinement part() const noexcept { return part_; }
  /// What a process exits with that must not run without, see frames::lackToldBy.
  [[nodiscard]] int exitStatus() const noexcept;

 private:
  frames::Confinement part_;
};

/// Settles what malloc does and the size of threads' stacks. Before the first thread is started.
void prepareMemory() noexcept;

/// What malloc keeps for messages to come goes back to the kernel, which takes as long as a message
/// of some kilobytes. At any time.
void giveBackMemory() noexcept;

/// Confines the process, threads that are running included; no other can be started afterwards.
/// Those threads must have got as far as code of ours: starting one takes calls that are forbidden.
/// Returns the frames::Confinement bits of what is in force, which are all but those that this
/// kernel or a sanitizer cannot do. Throws CannotConfine, some of it being in force by then.
std::uint32_t confine();

}  // namespace ironmoat::confinement
