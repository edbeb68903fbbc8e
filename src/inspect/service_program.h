#pragma once

#include <string>

namespace ironmoat::inspect {

/// The service that came with this tool: beside it as in a build tree, or where both are installed.
/// When there is none, the path where it should be installed.
std::string serviceProgram();

}  // namespace ironmoat::inspect
