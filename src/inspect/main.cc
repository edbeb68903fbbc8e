#include <algorithm>
#include <cstddef>
#include <exception>
#include <iostream>
#include <span>
#include <string>

#include "inspect/confinement_report.h"
#include "inspect/options.h"
#include "inspect/record_types.h"
#include "inspect/service_program.h"
#include "inspect/terminal.h"
#include "inspect/unpack_files.h"

namespace {

using ironmoat::inspect::Action;
using ironmoat::inspect::ExitStatus;
using ironmoat::inspect::Options;
using ironmoat::inspect::Terminal;

ExitStatus run(std::span<const char* const> arguments, Terminal& terminal) {
  const Options options = ironmoat::inspect::parseOptions(arguments);
  if (options.action == Action::unpack) return ironmoat::inspect::unpackFiles(options, terminal);
  if (options.action == Action::showSchema) {
    std::string text;
    ironmoat::inspect::recordType(options.schema)
        ->showSchema(options.format, terminal.outputColours(), text);
    terminal.print(text);
    terminal.flush();
    return ironmoat::inspect::allUnpacked;
  }
  if (options.action == Action::selfTest) {
    return static_cast<ExitStatus>(ironmoat::inspect::selfTest(
        std::cout,
        options.service.empty() ? ironmoat::inspect::serviceProgram() : options.service));
  }
  terminal.print(options.action == Action::showHelp ? ironmoat::inspect::helpText()
                                                    : "vesk-unpack " IRONMOAT_VERSION "\n");
  terminal.flush();
  return ironmoat::inspect::allUnpacked;
}

}  // namespace

int main(int argc, char** argv) {
  Terminal terminal;
  try {
    const std::span<const char* const> all(argv, static_cast<std::size_t>(argc));
    return run(all.subspan(std::min<std::size_t>(1, all.size())), terminal);
  } catch (const ironmoat::inspect::UsageError& error) {
    terminal.lastWords(std::string("vesk-unpack: ") + error.what() +
                       "\nTry 'vesk-unpack --help'.\n");
  } catch (const std::exception& error) {
    terminal.lastWords(std::string("vesk-unpack: ") + error.what() + '\n');
  }
  return ironmoat::inspect::cannotWork;
}
