#pragma once

namespace ironmoat::sandbox {

/// Puts the filter in force on the calling thread: a system call that is not listed, or not with
/// these arguments, kills the process with SIGSYS after its name is written to standard error. Sets
/// no_new_privs. False with errno set if the filter is unavailable.
[[nodiscard]] bool filterSystemCalls() noexcept;

}  // namespace ironmoat::sandbox
