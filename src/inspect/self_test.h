#pragma once

#include <ostream>
#include <string>

namespace ironmoat::inspect {

/// Starts the service and prints what it reports of its sandbox, then the results of actions that
/// the sandbox forbids, each tried in a child with the same sandbox. Returns 0 if the sandbox is
/// complete, 1 if it is not, 2 if the service cannot be used. Forks, so no other thread may run.
int selfTest(std::ostream& out, const std::string& serviceProgram);

}  // namespace ironmoat::inspect
