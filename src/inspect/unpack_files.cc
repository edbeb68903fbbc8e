#include "inspect/unpack_files.h"

#include <algorithm>
#include <chrono>
#include <deque>
#include <memory>
#include <string>
#include <system_error>
#include <vector>

#include "inspect/message_reader.h"
#include "inspect/report.h"
#include "inspect/service_program.h"
#include "ironmoat/client.h"

namespace ironmoat::inspect {

namespace {

// What may be under way at once: enough to keep the service busy, and few, because the record of a
// small message can take up to `limits::replyBytes`.
constexpr std::size_t kMostAttempts = 16;
constexpr std::size_t kMostBytes = std::size_t{32} << 20;

/// A person can wait longer than a daemon, and would rather, on a busy machine, than be told
/// nothing.
constexpr std::chrono::seconds kPatience{10};

std::span<const RecordType> typesNamed(const std::string& name) {
  if (name == kAutoType) return recordTypes();
  return {recordType(name), 1};
}

class Run {
 public:
  Run(const Options& options, Terminal& terminal)
      : options_(options),
        terminal_(terminal),
        types_(typesNamed(options.type)),
        report_(makeReport(options, terminal)),
        client_({.program = options.service.empty() ? serviceProgram() : options.service,
                 .deadline = kPatience}) {}

  ExitStatus unpackAll() {
    for (const std::string& file : options_.files) {
      submit(file);
      while (underWay_.size() * types_.size() >= kMostAttempts || bytesUnderWay_ > kMostBytes) {
        finishOldest();
      }
    }
    while (!underWay_.empty()) finishOldest();
    report_->finish();
    terminal_.flush();
    if (status_ == someRefused && !options_.typeGiven && options_.output == Output::each &&
        options_.format == Format::text) {
      terminal_.lastWords("(taken for " + options_.type + "; --type has others, and auto)\n");
    }
    return status_;
  }

 private:
  struct Message {
    const std::string* file;
    Data bytes;
    std::vector<Attempt> attempts;
    Outcome notSent;  // the outcome, if there are no attempts
  };

  void submit(const std::string& file) {
    Message message{.file = &file, .bytes = {}, .attempts = {}, .notSent = {}};
    try {
      message.bytes = reader_.read(file);
      for (const RecordType& type : types_) {
        message.attempts.push_back({&type, type.submit(client_, message.bytes)});
      }
    } catch (const DecodingError& error) {
      message.notSent.failure = failureOf(error);
    } catch (const std::system_error& error) {
      message.notSent.failure = failureOf(error);
    }
    bytesUnderWay_ += message.bytes.size();
    underWay_.push_back(std::move(message));
  }

  void finishOldest() {
    Message message = std::move(underWay_.front());
    underWay_.pop_front();
    bytesUnderWay_ -= message.bytes.size();
    const Outcome outcome =
        message.attempts.empty() ? std::move(message.notSent) : outcomeOf(message.attempts);
    status_ = std::max(status_, outcome.status());
    report_->add(*message.file, message.bytes, outcome);
    ++finished_;
    if (options_.output != Output::nothing) {
      terminal_.showProgress(finished_, options_.files.size());
    }
  }

  const Options& options_;
  Terminal& terminal_;
  const std::span<const RecordType> types_;
  const std::unique_ptr<Report> report_;
  Client client_;
  MessageReader reader_;
  std::deque<Message> underWay_;  // in the order of the files
  std::size_t bytesUnderWay_ = 0;
  std::size_t finished_ = 0;
  ExitStatus status_ = allUnpacked;
};

}  // namespace

ExitStatus unpackFiles(const Options& options, Terminal& terminal) {
  return Run(options, terminal).unpackAll();
}

}  // namespace ironmoat::inspect
