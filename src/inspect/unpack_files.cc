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
#include "inspect/unknown_keys_reader.h"
#include "ironmoat/client.h"

namespace ironmoat::inspect {

namespace {

// Limits on requests without an outcome: enough to keep the service busy, but few, because the
// record of a small message can take up to `limits::replyBytes`.
constexpr std::size_t kMaxAttempts = 16;
constexpr std::size_t kMaxBytes = std::size_t{32} << 20;

/// Longer than the client's default, because a person on a busy machine prefers to wait.
constexpr std::chrono::seconds kDeadline{10};

std::span<const RecordType> typesNamed(const std::string& name) {
  if (name == kAutoType) return recordTypes();
  return {recordType(name), 1};
}

/// Null for `--quiet`.
std::unique_ptr<Report> makeReport(const Options& options, Terminal& terminal) {
  if (options.output == Output::nothing) return nullptr;
  if (options.output == Output::summary) return makeSummary(options, terminal);
  if (options.format == Format::json) return makeJsonReport(options, terminal);
  return makeTextReport(options, terminal);
}

ClientOptions clientOptions(const Options& options) {
  return {.program = options.service.empty() ? serviceProgram() : options.service,
          .deadline = kDeadline};
}

class Run {
 public:
  Run(const Options& options, Terminal& terminal)
      : files_(filesOf(options)),
        terminal_(terminal),
        types_(typesNamed(options.type)),
        report_(makeReport(options, terminal)),
        client_(clientOptions(options)),
        strict_(options.strict),
        wantsUnknownKeys_(options.strict || options.output == Output::each),
        unknownKeys_(clientOptions(options)) {}

  ExitStatus unpackAll() {
    for (const std::string& file : files_) {
      submit(file);
      while (pending_.size() * types_.size() >= kMaxAttempts || pendingBytes_ > kMaxBytes) {
        finishOldest();
      }
    }
    while (!pending_.empty()) finishOldest();
    if (report_) report_->finish();
    terminal_.finish();
    return strict_ && status_ == allUnpacked && foundUnknownKeys_ ? unknownKeysFound : status_;
  }

 private:
  struct Message {
    const std::string* file;
    Data bytes;
    std::vector<Attempt> attempts;
    Outcome outcome;  // valid if there are no attempts
  };

  void submit(const std::string& file) {
    Message message{.file = &file, .bytes = {}, .attempts = {}, .outcome = {}};
    try {
      message.bytes = reader_.read(file);
      for (const RecordType& type : types_) {
        message.attempts.push_back({type.name, type.submit(client_, message.bytes)});
      }
    } catch (const DecodingError& error) {
      message.outcome.failure = failureOf(error);
    } catch (const std::system_error& error) {
      message.outcome.failure = failureOf(error);
    }
    pendingBytes_ += message.bytes.size();
    pending_.push_back(std::move(message));
  }

  void finishOldest() {
    Message message = std::move(pending_.front());
    pending_.pop_front();
    pendingBytes_ -= message.bytes.size();
    if (!message.attempts.empty()) message.outcome = outcomeOf(message.attempts);
    if (wantsUnknownKeys_ && message.outcome.record) addUnknownKeys(message);
    status_ = std::max(status_, message.outcome.status());
    if (!report_) return;
    report_->add(*message.file, message.bytes, message.outcome);
    terminal_.showProgress(++finished_, files_.size());
  }

  void addUnknownKeys(Message& message) {
    try {
      message.outcome.unknownKeys = unknownKeys_.read(*message.outcome.record, message.bytes);
      foundUnknownKeys_ |= message.outcome.unknownKeys.has_value();
    } catch (const DecodingError& error) {
      if (strict_) message.outcome.failure = failureOf(error);
    } catch (const ServiceError& error) {
      if (strict_) message.outcome.failure = failureOf(error);
    }
  }

  const std::vector<std::string> files_;
  Terminal& terminal_;
  const std::span<const RecordType> types_;
  const std::unique_ptr<Report> report_;
  Client client_;
  const bool strict_;
  const bool wantsUnknownKeys_;
  UnknownKeysReader unknownKeys_;
  bool foundUnknownKeys_ = false;
  MessageReader reader_;
  std::deque<Message> pending_;  // not yet reported, in the order of the files
  std::size_t pendingBytes_ = 0;
  std::size_t finished_ = 0;
  ExitStatus status_ = allUnpacked;
};

}  // namespace

ExitStatus unpackFiles(const Options& options, Terminal& terminal) {
  return Run(options, terminal).unpackAll();
}

}  // namespace ironmoat::inspect
