#include "inspect/service_program.h"

#include <unistd.h>

#include <filesystem>
#include <system_error>

namespace ironmoat::inspect {

std::string serviceProgram() {
  static constexpr const char* kName = "VeskIronmoatService";
  std::error_code ignored;
  const auto folder = std::filesystem::read_symlink("/proc/self/exe", ignored).parent_path();
  const auto beside = folder / kName;
  if (::access(beside.c_str(), X_OK) == 0) return beside;
  return (folder / IRONMOAT_LIBEXEC_FROM_BIN / kName).lexically_normal();
}

}  // namespace ironmoat::inspect
