#pragma once

#include <string>

namespace ironmoat::client {

/// The service's executable when the daemon names none: the one in the installation that the shared
/// library was loaded from, or, when that is none to trust and in the static library, the one where
/// this was configured to be installed. In a build without install rules the one of the build.
std::string defaultProgram();

}  // namespace ironmoat::client
