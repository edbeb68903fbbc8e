#include "inspect/json.h"
#include "inspect/place.h"
#include "inspect/report.h"

namespace ironmoat::inspect {

namespace {

void appendMember(std::string& out, std::string_view name, std::string_view value) {
  out.append("\"").append(name).append("\": ");
  appendJsonText(out, value);
}

class JsonReport : public Report {
 public:
  JsonReport(const Options& options, Terminal& terminal)
      : automatic_(options.type == kAutoType), terminal_(terminal) {}

  void add(const std::string& file, const Data& message, const Outcome& outcome) override {
    line_.clear();
    line_ += '{';
    appendMember(line_, "file", file);
    if (outcome.failure) {
      line_ += ", \"error\": {";
      addFailure(*outcome.failure, message);
      addRefusals(outcome.refusals, message);
      line_ += '}';
    } else {
      if (automatic_) addType(outcome);
      line_ += ", \"record\": ";
      outcome.record->show(Format::json, {}, line_);
    }
    line_ += "}\n";
    terminal_.print(line_);
  }

 private:
  void addFailure(const Failure& failure, const Data& message) {
    appendMember(line_, "kind", failure.kind);
    line_ += ", ";
    appendMember(line_, "path", failure.path);
    line_ += ", ";
    appendMember(line_, "message", failure.message);
    if (!failure.offset) return;
    line_.append(", \"offset\": ").append(std::to_string(*failure.offset));
    if (const auto place = placeInText(message, *failure.offset)) {
      line_.append(", \"line\": ").append(std::to_string(place->line));
      line_.append(", \"column\": ").append(std::to_string(place->column));
    }
  }

  void addRefusals(const std::vector<Outcome::Refusal>& refusals, const Data& message) {
    if (refusals.empty()) return;
    line_ += ", \"types\": [";
    for (const Outcome::Refusal& refusal : refusals) {
      line_ += &refusal == &refusals.front() ? "{" : ", {";
      appendMember(line_, "type", refusal.type);
      line_ += ", ";
      addFailure(refusal.why, message);
      line_ += '}';
    }
    line_ += ']';
  }

  void addType(const Outcome& outcome) {
    line_ += ", ";
    appendMember(line_, "type", outcome.type->name);
    line_ += ", \"asWell\": [";
    for (const std::string_view& type : outcome.asWell) {
      if (&type != &outcome.asWell.front()) line_ += ", ";
      appendJsonText(line_, type);
    }
    line_ += ']';
  }

  const bool automatic_;
  Terminal& terminal_;
  std::string line_;
};

}  // namespace

std::unique_ptr<Report> makeJsonReport(const Options& options, Terminal& terminal) {
  return std::make_unique<JsonReport>(options, terminal);
}

}  // namespace ironmoat::inspect
