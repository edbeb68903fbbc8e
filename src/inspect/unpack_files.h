#pragma once

#include "inspect/options.h"
#include "inspect/outcome.h"
#include "inspect/terminal.h"

namespace ironmoat::inspect {

/// Unpacks the files that `options` name and prints each outcome, in order, or a summary. Throws
/// std::system_error when standard output cannot be written, and what filesOf() throws.
ExitStatus unpackFiles(const Options& options, Terminal& terminal);

}  // namespace ironmoat::inspect
