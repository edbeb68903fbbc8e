#pragma once

#include "inspect/options.h"
#include "inspect/terminal.h"

namespace ironmoat::inspect {

/// The tool's exit status; of several, the highest counts.
enum ExitStatus : int {
  allUnpacked = 0,
  someRefused = 1,  ///< or the service failed over one
  cannotWork = 2,   ///< wrong usage, unreadable file, no service, output not writable
};

/// Unpacks `options.files` and prints what comes of each, in their order. Throws std::system_error
/// when standard output cannot be written.
ExitStatus unpackFiles(const Options& options, Terminal& terminal);

}  // namespace ironmoat::inspect
