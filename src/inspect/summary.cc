#include <algorithm>
#include <array>

#include "inspect/json.h"
#include "inspect/report.h"

namespace ironmoat::inspect {

namespace {

/// Numbers of messages, by what came of them.
class Summary : public Report {
 public:
  Summary(const Options& options, Terminal& terminal) : options_(options), terminal_(terminal) {}

  void add(const std::string&, const Data&, const Outcome& outcome) override {
    ++messages_;
    if (outcome.failure) {
      count(errors_, outcome.failure->kind);
    } else {
      ++accepted_;
      count(types_, outcome.type->name);
    }
  }

  void finish() override { terminal_.print(options_.format == Format::json ? json() : text()); }

 private:
  struct Count {
    std::string_view name;
    std::size_t number;
  };
  using Counts = std::vector<Count>;

  static void count(Counts& counts, std::string_view name) {
    const auto found = std::find_if(counts.begin(), counts.end(),
                                    [&](const Count& known) { return known.name == name; });
    if (found == counts.end()) {
      counts.push_back({name, 1});
    } else {
      ++found->number;
    }
  }

  /// The most frequent first.
  static Counts sorted(Counts counts) {
    std::sort(counts.begin(), counts.end(), [](const Count& a, const Count& b) {
      return a.number != b.number ? a.number > b.number : a.name < b.name;
    });
    return counts;
  }

  [[nodiscard]] bool showsTypes() const { return options_.type == kAutoType; }

  [[nodiscard]] std::string text() const {
    const std::size_t digits = std::to_string(messages_).size();
    std::string out;
    const auto line = [&](std::size_t number, std::string_view colour, std::string_view name) {
      const std::string text = std::to_string(number);
      out.append(digits - text.size(), ' ').append(text).append("  ");
      out.append(colour).append(name).append(terminal_.outputColours().end).append("\n");
    };
    const Colours& colours = terminal_.outputColours();
    line(messages_, colours.title, messages_ == 1 ? "message" : "messages");
    line(accepted_, colours.label, "accepted");
    if (showsTypes()) {
      for (const Count& type : sorted(types_)) {
        line(type.number, colours.label, "  as " + std::string(type.name));
      }
    }
    for (const Count& error : sorted(errors_)) line(error.number, colours.error, error.name);
    return out;
  }

  static void appendCounts(std::string& out, std::string_view name, const Counts& counts) {
    out.append(", \"").append(name).append("\": {");
    for (const Count& count : counts) {
      if (&count != &counts.front()) out += ", ";
      appendJsonText(out, count.name);
      out.append(": ").append(std::to_string(count.number));
    }
    out += '}';
  }

  [[nodiscard]] std::string json() const {
    std::string out = "{\"messages\": " + std::to_string(messages_);
    out.append(", \"accepted\": ").append(std::to_string(accepted_));
    if (showsTypes()) appendCounts(out, "types", sorted(types_));
    appendCounts(out, "errors", sorted(errors_));
    return out += "}\n";
  }

  const Options& options_;
  Terminal& terminal_;
  std::size_t messages_ = 0;
  std::size_t accepted_ = 0;
  Counts types_;
  Counts errors_;
};

}  // namespace

std::unique_ptr<Report> makeSummary(const Options& options, Terminal& terminal) {
  return std::make_unique<Summary>(options, terminal);
}

}  // namespace ironmoat::inspect
