#pragma once

namespace ironmoat::confinement {

/// Puts the filter in force on the calling thread: from now on a system call that is not on its
/// list, or has other arguments than the list says, kills the process with SIGSYS; which one is its
/// last word on standard error. False with errno set when that cannot be had. Needs no_new_privs,
/// which it sets.
[[nodiscard]] bool filterSystemCalls() noexcept;

}  // namespace ironmoat::confinement
