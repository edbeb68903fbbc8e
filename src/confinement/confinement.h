#pragma once

#include <cstddef>
#include <cstdint>
#include <system_error>

#include "frames/confinement_bits.h"

/// Takes from a process all that unpacking does not need: to be called before it looks at the first
/// byte that it was sent. Needs no privilege, no file and no namespace, and cannot be undone.
namespace ironmoat::confinement {

/// Bytes of address space for the whole process.
inline constexpr std::size_t kAddressSpace = std::size_t{1} << 30;

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

/// Confines the process, which must have a single thread, for good. Returns the frames::Confinement
/// bits of what is in force, which are all but those that this kernel, this processor or a
/// sanitizer cannot do. Throws CannotConfine, some of it being in force by then.
std::uint32_t confine();

}  // namespace ironmoat::confinement
