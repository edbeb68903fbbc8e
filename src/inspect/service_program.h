#pragma once

#include <string>

namespace ironmoat::inspect {

/// The path of the service beside this tool, as in a build tree, or of the same installation;
/// otherwise the client library's default. Throws std::runtime_error if other users can replace the
/// program.
std::string serviceProgram();

}  // namespace ironmoat::inspect
