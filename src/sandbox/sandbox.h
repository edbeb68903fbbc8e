#pragma once

#include <cstddef>
#include <cstdint>
#include <system_error>

#include "sandbox_parts/sandbox_parts.h"

/// Takes from a process all rights that unpacking does not need, before the process reads the first
/// byte of a request. Needs no privilege, no file and no namespace; cannot be undone.
namespace ironmoat::sandbox {

/// Bytes of address space for the whole process.
inline constexpr std::size_t kAddressSpace = std::size_t{1} << 30;

/// A required part of the sandbox is unavailable; `code()` says why.
class Unavailable : public std::system_error {
 public:
  Unavailable(Part part, int error);
  /// The exit status of a process that does not run without the part: see lackToldBy().
  [[nodiscard]] int exitStatus() const noexcept { return exitStatus_; }

 private:
  int exitStatus_;
};

/// Sandboxes the process, which must have a single thread, for good. Returns the bits of the Parts
/// in force: all but those that this kernel, this processor or a sanitizer does not allow. Throws
/// Unavailable; then some of the parts are in force.
std::uint32_t enter();

}  // namespace ironmoat::sandbox
