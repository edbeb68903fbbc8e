#include <algorithm>

#include "inspect/position.h"
#include "inspect/report.h"
#include "inspect/text_view.h"

namespace ironmoat::inspect {

namespace {

class TextReport : public Report {
 public:
  TextReport(const Options& options, Terminal& terminal) : options_(options), terminal_(terminal) {}

  void add(const std::string& file, const Data& message, const Outcome& outcome) override {
    text_.clear();
    if (outcome.failure) {
      addFailure(file, message, outcome);
      terminal_.printError(text_);
    } else {
      addRecord(file, outcome);
      terminal_.print(text_);
    }
    rejected_ |= outcome.status() == someRejected;
  }

  void finish() override {
    if (rejected_ && !options_.typeGiven) {
      terminal_.printError("(decoded as " + options_.type + "; --type auto tries all types)\n");
    }
  }

 private:
  void addRecord(const std::string& file, const Outcome& outcome) {
    const Style style = terminal_.outputStyle();
    if (printedRecord_) text_ += '\n';
    printedRecord_ = true;
    text_ += style.colours.title;
    appendEscaped(text_, file);
    text_ += style.colours.end;
    if (options_.type == kAutoType) {
      text_.append(style.colours.aside).append(" (");
      for (std::size_t i = 0; i < outcome.types.size(); ++i) {
        text_.append(i == 0 ? "" : i == 1 ? "; also fits: " : ", ").append(outcome.types[i]);
      }
      text_.append(")").append(style.colours.end);
    }
    text_ += '\n';
    std::visit([&](const auto& record) { TextView(text_, style).record(record, 2); },
               *outcome.record);
    if (outcome.unknownKeys) addUnknownKeys(*outcome.unknownKeys, style);
  }

  void addUnknownKeys(const UnknownKeys& unknown, const Style& style) {
    if (options_.strict) {
      text_.append(style.colours.error).append("  unknown keys").append(style.colours.end) += '\n';
      TextView(text_, style).record(unknown, 4);
    } else {
      text_.append(style.colours.aside).append("  (").append(std::to_string(unknown.count));
      text_.append(unknown.count == 1 ? " unknown key" : " unknown keys");
      text_.append("; --strict lists them)").append(style.colours.end) += '\n';
    }
  }

  void addFailure(const std::string& file, const Data& message, const Outcome& outcome) {
    text_ += "vesk-unpack: ";
    appendEscaped(text_, file);
    text_ += ": ";
    addReason(*outcome.failure, message, 2);
    for (const Outcome::Rejection& rejection : outcome.rejections) {
      text_.append("  ").append(rejection.type).append(": ");
      addReason(rejection.why, message, 4);
    }
  }

  void addReason(const Failure& failure, const Data& message, std::size_t indent) {
    const Style style = terminal_.errorStyle();
    const std::size_t lineStart = text_.rfind('\n') + 1;
    text_.append(style.colours.error).append(failure.kind).append(style.colours.end);
    if (!failure.path.empty()) {
      text_ += " at ";
      appendEscaped(text_, failure.path);
    }
    std::string words = ":\n";
    appendEscaped(words, failure.description);
    std::replace(words.begin(), words.end(), ' ', '\n');
    const std::size_t column = columnsOf(std::string_view(text_).substr(lineStart));
    appendWrapped(text_, words, column, indent + 2, style.width);
    text_ += '\n';
    if (failure.offset) appendPosition(text_, message, *failure.offset, style, indent);
  }

  const Options& options_;
  Terminal& terminal_;
  bool printedRecord_ = false;
  bool rejected_ = false;
  std::string text_;
};

}  // namespace

std::unique_ptr<Report> makeTextReport(const Options& options, Terminal& terminal) {
  return std::make_unique<TextReport>(options, terminal);
}

}  // namespace ironmoat::inspect
