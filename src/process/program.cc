#include "process/program.h"

#include <dlfcn.h>
#include <sys/auxv.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <system_error>

namespace ironmoat::process {

namespace {

namespace fs = std::filesystem;

constexpr const char* kName = "VeskIronmoatService";

/// Empty when there is none.
std::string programOfThisInstallation() {
  // A program with privileges that its caller lacks goes by nothing that the caller may have moved.
  if (::getauxval(AT_SECURE) != 0) return {};
  if (IRONMOAT_LIBEXEC_FROM_LIB[0] == '\0') return {};  // it is not to be installed
  Dl_info self = {};
  if (::dladdr(reinterpret_cast<const void*>(&defaultProgram), &self) == 0) return {};
  std::error_code error;
  if (!fs::path(self.dli_fname).is_absolute()) return {};
  const fs::path file = fs::canonical(self.dli_fname, error);
  // The static library is part of the daemon, whose place says nothing about the service's.
  if (error || !file.filename().string().starts_with("libironmoat.so")) return {};
  const fs::path program =
      fs::canonical(file.parent_path() / IRONMOAT_LIBEXEC_FROM_LIB / kName, error);
  // Being beside the library proves nothing: below /tmp/lib lies /tmp/libexec, which anyone could
  // have made.
  if (error || !isOutOfOthersReach(program)) return {};
  return ::access(program.c_str(), X_OK) == 0 ? program.string() : std::string();
}

}  // namespace

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

std::string defaultProgram() {
  std::string found = programOfThisInstallation();
  return found.empty() ? std::string(IRONMOAT_LIBEXEC) + '/' + kName : found;
}

}  // namespace ironmoat::process
