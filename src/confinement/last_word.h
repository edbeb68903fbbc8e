#pragma once

namespace ironmoat::confinement {

/// From now on the first system call that a filter answers with SIGSYS is named on standard error,
/// "forbidden system call 41 (socket)", before it kills the process as if nothing had been said. To
/// be called before such a filter is in force, with SIGSYS as the process was started with it.
void nameForbiddenCall() noexcept;

}  // namespace ironmoat::confinement
