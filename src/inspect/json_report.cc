#include "inspect/position.h"
#include "inspect/report.h"

namespace ironmoat::inspect {

namespace {

class JsonReport : public Report {
 public:
  JsonReport(const Options& options, Terminal& terminal) : options_(options), terminal_(terminal) {}

  void add(const std::string& file, const Data& message, const Outcome& outcome) override {
    std::string line;
    JsonWriter json(line);
    json.open('{').member("file", file);
    if (outcome.failure) {
      json.name("error").open('{');
      addFailure(json, *outcome.failure, message);
      if (!outcome.rejections.empty()) {
        json.name("types").open('[');
        for (const Outcome::Rejection& rejection : outcome.rejections) {
          json.open('{').member("type", rejection.type);
          addFailure(json, rejection.why, message);
          json.close('}');
        }
        json.close(']');
      }
      json.close('}');
    } else {
      if (options_.type == kAutoType) {
        json.member("type", outcome.types.front());
        json.member("asWell", std::span(outcome.types).subspan(1));
      }
      json.name("record");
      std::visit([&](const auto& record) { JsonWriter(line, options_.integers).value(record); },
                 *outcome.record);
      if (outcome.unknownKeys) json.member("unknownKeys", *outcome.unknownKeys);
    }
    json.close('}');
    terminal_.print(line += '\n');
  }

 private:
  static void addFailure(JsonWriter& json, const Failure& failure, const Data& message) {
    json.member("kind", failure.kind).member("path", failure.path);
    json.member("message", failure.description);
    if (!failure.offset) return;
    json.member("offset", *failure.offset);
    if (const auto position = positionInText(message, *failure.offset)) {
      json.member("line", position->line).member("column", position->column);
    }
  }

  const Options& options_;
  Terminal& terminal_;
};

}  // namespace

std::unique_ptr<Report> makeJsonReport(const Options& options, Terminal& terminal) {
  return std::make_unique<JsonReport>(options, terminal);
}

}  // namespace ironmoat::inspect
