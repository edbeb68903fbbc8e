#include "inspect/options.h"

#include <algorithm>
#include <optional>

#include "inspect/record_types.h"
#include "inspect/text_view.h"

namespace ironmoat::inspect {

namespace {

std::string quoted(std::string_view text) {
  std::string out = "'";
  appendHarmless(out, text);
  out += '\'';
  return out;
}

class Arguments {
 public:
  explicit Arguments(std::span<const char* const> rest) : rest_(rest) {}

  [[nodiscard]] bool empty() const noexcept { return rest_.empty(); }

  std::string_view take() noexcept {
    const std::string_view first = rest_.front();
    rest_ = rest_.subspan(1);
    return first;
  }

  /// The value of `option` when `argument` is that option, alone or as `option=value`.
  std::optional<std::string> valueOf(std::string_view option, std::string_view argument) {
    if (!argument.starts_with(option)) return std::nullopt;
    argument.remove_prefix(option.size());
    if (argument.starts_with('=')) return std::string(argument.substr(1));
    if (!argument.empty()) return std::nullopt;
    if (empty()) throw UsageError("option " + quoted(option) + " needs a value");
    return std::string(take());
  }

 private:
  std::span<const char* const> rest_;
};

Format formatNamed(std::string_view name) {
  if (name == "text") return Format::text;
  if (name == "json") return Format::json;
  throw UsageError("unknown format " + quoted(name) + ": text or json");
}

void checkType(std::string_view name) {
  if (recordType(name) != nullptr) return;
  std::string known;
  for (const RecordType& type : recordTypes()) {
    if (!known.empty()) known += ", ";
    known += type.name;
  }
  throw UsageError("unknown type " + quoted(name) + ": one of " + known);
}

}  // namespace

Options parseOptions(std::span<const char* const> arguments) {
  Options options;
  Arguments rest(arguments);
  bool onlyFiles = false;
  while (!rest.empty()) {
    const std::string_view argument = rest.take();
    if (onlyFiles || argument == kStandardInput || !argument.starts_with('-')) {
      options.files.emplace_back(argument);
    } else if (argument == "--") {
      onlyFiles = true;
    } else if (argument == "--help" || argument == "-h") {
      options.action = Action::showHelp;
      return options;
    } else if (argument == "--version") {
      options.action = Action::showVersion;
      return options;
    } else if (argument == "--self-test") {
      options.action = Action::selfTest;
    } else if (auto type = rest.valueOf("--type", argument)) {
      options.type = *std::move(type);
    } else if (const auto format = rest.valueOf("--format", argument)) {
      options.format = formatNamed(*format);
    } else if (auto service = rest.valueOf("--service", argument)) {
      if (service->empty()) throw UsageError("option '--service' needs a program");
      options.service = *std::move(service);
    } else {
      throw UsageError("unknown option " + quoted(argument));
    }
  }
  checkType(options.type);
  if (options.action == Action::selfTest) {
    if (!options.files.empty()) throw UsageError("option '--self-test' goes without files");
    return options;
  }
  if (options.files.empty()) options.files.emplace_back(kStandardInput);
  if (std::count(options.files.begin(), options.files.end(), kStandardInput) > 1) {
    throw UsageError("standard input can be read only once");
  }
  return options;
}

std::string_view helpText() noexcept {
  return R"(Usage: vesk-unpack [OPTION...] [FILE...]

Has each FILE, one property-list message (binary or XML), unpacked by the
service VeskIronmoatService in a process of its own, and prints the record, or
why the message was refused. Without FILE, or for -, reads standard input.

  --type TYPE        what the messages are: payload (default), command-response,
                     web-tunnel-response
  --format FORMAT    text (default), for people: records on standard output,
                     refusals on standard error, long values cut; or
                     json, for programs: one line for each FILE, in order,
                     {"file": F, "record": {...}} or
                     {"file": F, "error": {"kind": K, "path": P, "message": M}}
  --service PROGRAM  use this service, not the one that came with this tool
  --self-test        show what confines the service, and what comes of what is
                     forbidden to it
  --help, -h         print this
  --version          print the version

Kinds of error: malformed, limitExceeded, typeMismatch, outOfRange, keyNotFound
(the message was refused), crashed, timedOut (the service failed over it),
unavailable (no service could be had), unreadable (FILE could not be read).

Exit status: 0 all unpacked; 1 some message refused, or the service failed over
it, or it is not confined as it has to be; 2 wrong usage, a FILE that could not
be read, no service, output not writable.
)";
}

}  // namespace ironmoat::inspect
