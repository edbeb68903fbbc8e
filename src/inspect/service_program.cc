#include "inspect/service_program.h"

#include <unistd.h>

#include <filesystem>
#include <stdexcept>
#include <system_error>

#include "client/default_program.h"
#include "client/trusted_path.h"
#include "inspect/text_view.h"

namespace ironmoat::inspect {

std::string serviceProgram() {
  namespace fs = std::filesystem;
  static constexpr const char* kName = "VeskIronmoatService";
  std::error_code error;
  const fs::path tool = fs::read_symlink("/proc/self/exe", error);
  if (error) return client::defaultProgram();
  const fs::path folder = tool.parent_path();
  for (const fs::path& path : {folder / kName, folder / IRONMOAT_LIBEXEC_FROM_BIN / kName}) {
    const fs::path program = fs::canonical(path, error);
    if (error || ::access(program.c_str(), X_OK) != 0) continue;
    if (client::isOutOfOthersReach(program)) return program;
    throw std::runtime_error("service program not allowed: other users can replace " +
                             inQuotes(program.string()));
  }
  return client::defaultProgram();
}

}  // namespace ironmoat::inspect
