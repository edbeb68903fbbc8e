#pragma once

#include "inspect/options.h"
#include "inspect/outcome.h"
#include "inspect/terminal.h"

namespace ironmoat::inspect {

/// Unpacks `options.files` and prints what comes of each, in their order, or of all together.
/// Throws std::system_error when standard output cannot be written.
ExitStatus unpackFiles(const Options& options, Terminal& terminal);

}  // namespace ironmoat::inspect
