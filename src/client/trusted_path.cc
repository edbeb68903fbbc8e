#include "client/trusted_path.h"

#include <sys/stat.h>
#include <unistd.h>

namespace ironmoat::client {

bool isOutOfOthersReach(std::filesystem::path path) {
  for (;; path = path.parent_path()) {
    struct stat status = {};
    if (::lstat(path.c_str(), &status) != 0) return false;
    if (status.st_uid != 0 && status.st_uid != ::geteuid()) return false;
    // In a sticky folder others cannot rename or remove what is not theirs.
    const bool sticky = S_ISDIR(status.st_mode) && (status.st_mode & S_ISVTX) != 0;
    if ((status.st_mode & (S_IWGRP | S_IWOTH)) != 0 && !sticky) return false;
    if (!path.has_relative_path()) return true;
  }
}

}  // namespace ironmoat::client
