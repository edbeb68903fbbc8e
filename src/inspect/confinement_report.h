#pragma once

#include <ostream>
#include <string>

namespace ironmoat::inspect {

/// Starts the service and prints, a line each, what it reports to be confined by and what comes of
/// acts that this forbids, each tried in a child confined by the same code. Returns 0 when all is
/// as it has to be, 1 when something is not, 2 when there is no service. Not while other threads
/// run: it forks.
int selfTest(std::ostream& out, const std::string& serviceProgram);

}  // namespace ironmoat::inspect
