#pragma once

#include <string>

namespace ironmoat::inspect {

/// The service that came with this tool: beside it as in a build tree, or where both are installed;
/// otherwise the client library's default. Throws std::runtime_error if other users can replace the
/// program that it finds.
std::string serviceProgram();

}  // namespace ironmoat::inspect
