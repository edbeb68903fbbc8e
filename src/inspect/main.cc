#include <algorithm>
#include <cstddef>
#include <exception>
#include <iostream>
#include <span>
#include <string>

#include "frames/frame.h"
#include "inspect/options.h"
#include "inspect/self_test.h"
#include "inspect/service_program.h"
#include "inspect/terminal.h"
#include "inspect/unpack_files.h"

namespace {

using namespace ironmoat;
using namespace ironmoat::inspect;

int run(std::span<const char* const> arguments, Terminal& terminal) {
  const Options options = parseOptions(arguments);
  switch (options.action) {
    case Action::unpack:
      return unpackFiles(options, terminal);
    case Action::selfTest:
      return selfTest(std::cout, options.service.empty() ? serviceProgram() : options.service);
    case Action::showSchema: {
      const auto schemas = recordType(options.schema)->schemas();
      terminal.print(options.format == Format::json
                         ? schemasAsJson(schemas)
                         : schemasAsText(schemas, terminal.outputStyle().colours));
      break;
    }
    case Action::showHelp:
      terminal.print(helpText());
      break;
    case Action::showVersion:
      terminal.print("vesk-unpack " IRONMOAT_VERSION ", frames version " +
                     std::to_string(frames::kVersion) + '\n');
  }
  terminal.finish();
  return allUnpacked;
}

}  // namespace

int main(int argc, char** argv) {
  Terminal terminal;
  try {
    const std::span<const char* const> all(argv, static_cast<std::size_t>(argc));
    return run(all.subspan(std::min<std::size_t>(1, all.size())), terminal);
  } catch (const UsageError& error) {
    terminal.printError(std::string("vesk-unpack: ") + error.what() +
                        "\nTry 'vesk-unpack --help'.\n");
  } catch (const std::exception& error) {
    terminal.printError(std::string("vesk-unpack: ") + error.what() + '\n');
  }
  return cannotWork;
}
