#pragma once

namespace ironmoat::sandbox {

/// Installs a handler that writes the name of the first forbidden system call to standard error, as
/// in "forbidden system call 41 (socket)", before SIGSYS kills the process. Must be called before
/// the filter is in force, while SIGSYS has its default action.
void nameForbiddenCall() noexcept;

}  // namespace ironmoat::sandbox
