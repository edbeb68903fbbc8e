#include <algorithm>
#include <chrono>
#include <map>

#include "inspect/report.h"

namespace ironmoat::inspect {

namespace {

/// Counts messages by outcome, and measures their rate.
class Summary : public Report {
 public:
  Summary(const Options& options, Terminal& terminal) : options_(options), terminal_(terminal) {}

  void add(const std::string&, const Data& message, const Outcome& outcome) override {
    ++messages_;
    bytes_ += message.size();
    if (outcome.failure) {
      ++errors_[outcome.failure->kind];
    } else {
      ++accepted_;
      ++types_[outcome.types.front()];
      if (outcome.unknownKeys) ++withUnknownKeys_;
    }
  }

  void finish() override {
    const std::chrono::duration<double> time = std::chrono::steady_clock::now() - start_;
    terminal_.print(options_.format == Format::json ? json(time.count()) : text(time.count()));
  }

 private:
  using Counts = std::map<std::string_view, std::size_t>;

  [[nodiscard]] std::string text(double seconds) const {
    const Colours colours = terminal_.outputStyle().colours;
    const auto number = static_cast<double>(messages_);
    const int digits = static_cast<int>(std::to_string(messages_).size());
    std::string out = std::to_string(messages_).append("  ").append(colours.title);
    out.append(messages_ == 1 ? "message" : "messages").append(colours.end);
    out += formatted(" in %.3f s (%.0f/s, %.2f MB/s)\n", seconds, number / seconds,
                     static_cast<double>(bytes_) / seconds / 1e6);
    const auto line = [&](std::size_t count, std::string_view colour, std::string_view name) {
      out.append(formatted("%*zu  ", digits, count)).append(colour).append(name);
      out.append(colours.end)
          .append(
              formatted(" (%.1f %%)\n", 100 * static_cast<double>(count) / std::max(number, 1.)));
    };
    line(accepted_, colours.label, "accepted");
    if (options_.type == kAutoType) {
      for (const auto& [type, count] : types_)
        line(count, colours.label, "  as " + std::string(type));
    }
    if (options_.strict) line(withUnknownKeys_, colours.label, "  with unknown keys");
    for (const auto& [kind, count] : errors_) line(count, colours.error, kind);
    return out;
  }

  [[nodiscard]] std::string json(double seconds) const {
    std::string out;
    JsonWriter json(out);
    const auto addCounts = [&](std::string_view name, const Counts& counts) {
      json.name(name).open('{');
      for (const auto& [each, number] : counts) json.member(each, number);
      json.close('}');
    };
    json.open('{').member("messages", messages_).member("accepted", accepted_);
    if (options_.strict) json.member("withUnknownKeys", withUnknownKeys_);
    if (options_.type == kAutoType) addCounts("types", types_);
    addCounts("errors", errors_);
    json.member("bytes", bytes_).name("seconds");
    return out.append(std::to_string(seconds)).append("}\n");
  }

  const Options& options_;
  Terminal& terminal_;
  const std::chrono::steady_clock::time_point start_ = std::chrono::steady_clock::now();
  std::size_t messages_ = 0;
  std::size_t accepted_ = 0;
  std::size_t withUnknownKeys_ = 0;
  std::size_t bytes_ = 0;
  Counts types_;
  Counts errors_;
};

}  // namespace

std::unique_ptr<Report> makeSummary(const Options& options, Terminal& terminal) {
  return std::make_unique<Summary>(options, terminal);
}

}  // namespace ironmoat::inspect
