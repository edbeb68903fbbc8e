#include "inspect/service_program.h"

#include <unistd.h>

#include <filesystem>
#include <stdexcept>
#include <system_error>

#include "inspect/text_view.h"
#include "process/program.h"

namespace ironmoat::inspect {

std::string serviceProgram() {
  namespace fs = std::filesystem;
  static constexpr const char* kName = "VeskIronmoatService";
  std::error_code error;
  const fs::path tool = fs::read_symlink("/proc/self/exe", error);
  if (error) return process::defaultProgram();
  const fs::path folder = tool.parent_path();
  for (const fs::path& path : {folder / kName, folder / IRONMOAT_LIBEXEC_FROM_BIN / kName}) {
    const fs::path program = fs::canonical(path, error);
    if (error || ::access(program.c_str(), X_OK) != 0) continue;
    if (process::isOutOfOthersReach(program)) return program;
    throw std::runtime_error("service program not allowed: other users can replace " +
                             inQuotes(program.string()));
  }
  return process::defaultProgram();
}

}  // namespace ironmoat::inspect
