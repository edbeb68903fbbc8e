#pragma once

#include <filesystem>

namespace ironmoat::client {

/// True if only root and this process's user can replace the file `path`, or change it. The path
/// must be absolute and free of symbolic links.
bool isOutOfOthersReach(std::filesystem::path path);

}  // namespace ironmoat::client
