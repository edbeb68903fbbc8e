#pragma once

#include <memory>
#include <string>

#include "inspect/options.h"
#include "inspect/outcome.h"
#include "inspect/terminal.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

/// Prints the outcomes of messages. Throws std::system_error when standard output cannot be
/// written.
class Report {
 public:
  Report() = default;
  Report(const Report&) = delete;
  Report& operator=(const Report&) = delete;
  virtual ~Report() = default;

  /// `message` is the content of the file; empty if it could not be read.
  virtual void add(const std::string& file, const Data& message, const Outcome& outcome) = 0;
  virtual void finish() {}
};

/// `options` and `terminal` must outlive the report.
std::unique_ptr<Report> makeTextReport(const Options& options, Terminal& terminal);
std::unique_ptr<Report> makeJsonReport(const Options& options, Terminal& terminal);
std::unique_ptr<Report> makeSummary(const Options& options, Terminal& terminal);

}  // namespace ironmoat::inspect
