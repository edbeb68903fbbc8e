#include <algorithm>

#include "inspect/place.h"
#include "inspect/report.h"

namespace ironmoat::inspect {

namespace {

class TextReport : public Report {
 public:
  TextReport(const Options& options, Terminal& terminal)
      : automatic_(options.type == kAutoType), terminal_(terminal) {}

  void add(const std::string& file, const Data& message, const Outcome& outcome) override {
    text_.clear();
    if (outcome.failure) {
      addFailure(file, message, outcome);
      terminal_.complain(text_);
    } else {
      addRecord(file, outcome);
      terminal_.print(text_);
    }
  }

 private:
  void addRecord(const std::string& file, const Outcome& outcome) {
    const Colours& colours = terminal_.outputColours();
    if (printedRecord_) text_ += '\n';
    printedRecord_ = true;
    text_ += colours.title;
    appendHarmless(text_, file);
    text_ += colours.end;
    if (automatic_) addType(outcome);
    text_ += '\n';
    outcome.record->show(Format::text, {colours, terminal_.outputWidth()}, text_);
  }

  void addType(const Outcome& outcome) {
    const Colours& colours = terminal_.outputColours();
    text_.append(colours.aside).append(" (").append(outcome.type->name);
    for (const std::string_view& type : outcome.asWell) {
      text_ += &type == &outcome.asWell.front() ? "; as well: " : ", ";
      text_ += type;
    }
    text_.append(")").append(colours.end);
  }

  void addFailure(const std::string& file, const Data& message, const Outcome& outcome) {
    text_ += "vesk-unpack: ";
    appendHarmless(text_, file);
    text_ += ": ";
    addReason(*outcome.failure, message, 2);
    for (const Outcome::Refusal& refusal : outcome.refusals) {
      text_.append("  ").append(refusal.type).append(": ");
      addReason(refusal.why, message, 4);
    }
  }

  void addReason(const Failure& failure, const Data& message, std::size_t indent) {
    const Colours& colours = terminal_.errorColours();
    const std::size_t start = text_.rfind('\n') + 1;  // of the line
    text_.append(colours.error).append(failure.kind).append(colours.end);
    if (!failure.path.empty()) {
      text_ += " at ";
      appendHarmless(text_, failure.path);
    }
    text_ += ':';
    const std::size_t unseen = colours.error.size() + colours.end.size();
    addWords(failure.message, text_.size() - start - unseen, indent + 2);
    if (failure.offset) {
      appendPlace(text_, message, *failure.offset, {colours, terminal_.errorWidth()}, indent);
    }
  }

  /// A sentence behind `column` columns, on more lines where the screen is too narrow.
  void addWords(std::string_view sentence, std::size_t column, std::size_t indent) {
    std::string words;
    appendHarmless(words, sentence);
    const std::size_t width = terminal_.errorWidth();
    for (std::size_t at = 0; at < words.size();) {
      const std::size_t end = std::min(words.find(' ', at), words.size());
      column += 1 + end - at;
      if (width != 0 && column > width) {
        text_ += '\n';
        text_.append(indent, ' ');
        column = indent + end - at;
      } else {
        text_ += ' ';
      }
      text_.append(words, at, end - at);
      at = end + 1;
    }
    text_ += '\n';
  }

  const bool automatic_;
  Terminal& terminal_;
  bool printedRecord_ = false;
  std::string text_;
};

}  // namespace

std::unique_ptr<Report> makeTextReport(const Options& options, Terminal& terminal) {
  return std::make_unique<TextReport>(options, terminal);
}

}  // namespace ironmoat::inspect
