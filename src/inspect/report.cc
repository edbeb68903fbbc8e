#include "inspect/report.h"

namespace ironmoat::inspect {

namespace {

class NoReport : public Report {
 public:
  void add(const std::string&, const Data&, const Outcome&) override {}
};

}  // namespace

std::unique_ptr<Report> makeReport(const Options& options, Terminal& terminal) {
  if (options.output == Output::nothing) return std::make_unique<NoReport>();
  if (options.output == Output::summary) return makeSummary(options, terminal);
  if (options.format == Format::json) return makeJsonReport(options, terminal);
  return makeTextReport(options, terminal);
}

}  // namespace ironmoat::inspect
