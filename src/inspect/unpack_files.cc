#include "inspect/unpack_files.h"

#include <algorithm>
#include <chrono>
#include <deque>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

#include "inspect/json.h"
#include "inspect/message_reader.h"
#include "inspect/record_types.h"
#include "inspect/service_program.h"
#include "inspect/text_view.h"
#include "ironmoat/client.h"
#include "ironmoat/errors.h"

namespace ironmoat::inspect {

namespace {

// What may be under way at once: enough to keep the service busy, and few, because the record of a
// small message can take up to `limits::replyBytes`.
constexpr std::size_t kMostMessages = 16;
constexpr std::size_t kMostBytes = std::size_t{32} << 20;

struct Failure {
  std::string_view kind;
  std::string path;
  std::string message;
  ExitStatus status;
};

Failure failureOf(const DecodingError& error) {
  return {nameOf(error.kind()), error.path(), error.what(), someRefused};
}

Failure failureOf(const ServiceError& error) {
  const bool noService = error.kind() == ServiceError::Kind::unavailable;
  return {nameOf(error.kind()), "", error.what(), noService ? cannotWork : someRefused};
}

/// A person can wait longer than a daemon, and would rather, on a busy machine, than be told
/// nothing.
constexpr std::chrono::seconds kPatience{10};

class Run {
 public:
  Run(const Options& options, Terminal& terminal)
      : options_(options),
        terminal_(terminal),
        type_(*recordType(options.type)),
        client_({.program = options.service.empty() ? serviceProgram() : options.service,
                 .deadline = kPatience}) {}

  ExitStatus unpackAll() {
    for (const std::string& file : options_.files) {
      submit(file);
      while (underWay_.size() >= kMostMessages || bytesUnderWay_ > kMostBytes) finishOldest();
    }
    while (!underWay_.empty()) finishOldest();
    terminal_.flush();
    return status_;
  }

 private:
  struct Message {
    const std::string* file;
    std::size_t bytes;
    PendingRecord record;
    std::optional<Failure> notSent;  // if so there is no record to wait for
  };

  void submit(const std::string& file) {
    Message message{.file = &file, .bytes = 0, .record = {}, .notSent = {}};
    try {
      const Data bytes = reader_.read(file);
      message.record = type_.submit(client_, bytes);
      message.bytes = bytes.size();
    } catch (const DecodingError& error) {
      message.notSent = failureOf(error);
    } catch (const std::system_error& error) {
      message.notSent = Failure{"unreadable", "", error.code().message(), cannotWork};
    }
    bytesUnderWay_ += message.bytes;
    underWay_.push_back(std::move(message));
  }

  void finishOldest() {
    const Message message = std::move(underWay_.front());
    underWay_.pop_front();
    bytesUnderWay_ -= message.bytes;
    text_.clear();
    if (message.notSent) {
      printFailure(*message.file, *message.notSent);
    } else {
      try {
        message.record(options_.format, terminal_.outputColours(), text_);
        printRecord(*message.file);
      } catch (const DecodingError& error) {
        printFailure(*message.file, failureOf(error));
      } catch (const ServiceError& error) {
        printFailure(*message.file, failureOf(error));
      }
    }
    terminal_.showProgress(++finished_, options_.files.size());
  }

  void printRecord(const std::string& file) {
    std::string head;
    if (options_.format == Format::json) {
      head = "{\"file\": ";
      appendJsonText(head, file);
      head += ", \"record\": ";
      text_ += "}\n";
    } else {
      if (printedRecord_) head = "\n";
      head += terminal_.outputColours().title;
      appendHarmless(head, file);
      head += terminal_.outputColours().end;
      head += '\n';
    }
    printedRecord_ = true;
    terminal_.print(head);
    terminal_.print(text_);
  }

  void printFailure(const std::string& file, const Failure& failure) {
    status_ = std::max(status_, failure.status);
    if (options_.format == Format::json) {
      printFailureAsJson(file, failure);
    } else {
      printFailureAsText(file, failure);
    }
  }

  void printFailureAsJson(const std::string& file, const Failure& failure) {
    std::string line = "{\"file\": ";
    appendJsonText(line, file);
    line += ", \"error\": {\"kind\": ";
    appendJsonText(line, failure.kind);
    line += ", \"path\": ";
    appendJsonText(line, failure.path);
    line += ", \"message\": ";
    appendJsonText(line, failure.message);
    line += "}}\n";
    terminal_.print(line);
  }

  // The path and the message come from the service, which the sender may have taken over.
  void printFailureAsText(const std::string& file, const Failure& failure) {
    const Colours& colours = terminal_.errorColours();
    std::string line = "vesk-unpack: ";
    appendHarmless(line, file);
    line += ": ";
    line += colours.error;
    line += failure.kind;
    line += colours.end;
    if (!failure.path.empty()) {
      line += " at ";
      appendHarmless(line, failure.path);
    }
    line += ": ";
    appendHarmless(line, failure.message);
    line += '\n';
    terminal_.complain(line);
  }

  const Options& options_;
  Terminal& terminal_;
  const RecordType& type_;
  Client client_;
  MessageReader reader_;
  std::deque<Message> underWay_;  // in the order of the files
  std::size_t bytesUnderWay_ = 0;
  std::size_t finished_ = 0;
  bool printedRecord_ = false;
  std::string text_;
  ExitStatus status_ = allUnpacked;
};

}  // namespace

ExitStatus unpackFiles(const Options& options, Terminal& terminal) {
  return Run(options, terminal).unpackAll();
}

}  // namespace ironmoat::inspect
