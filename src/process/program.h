#pragma once

#include <filesystem>
#include <string>

namespace ironmoat::process {

/// The service's executable when the daemon names none: the one in the installation that the shared
/// library was loaded from if that can be trusted, otherwise and in the static library the one
/// where this was configured to be installed. In a build without install rules the one of the
/// build.
std::string defaultProgram();

/// Only root and this process's user can change the file or a folder above it. Requires an absolute
/// path without symbolic links.
bool isOutOfOthersReach(std::filesystem::path path);

}  // namespace ironmoat::process
