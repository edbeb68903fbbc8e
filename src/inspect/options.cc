#include "inspect/options.h"

#include <getopt.h>

#include <algorithm>

#include "inspect/record_types.h"
#include "inspect/terminal_text.h"

namespace ironmoat::inspect {

namespace {

template <class T>
void setOnce(T& setting, T value, const char* options) {
  if (setting != T{} && setting != value) {
    throw UsageError(std::string("options ") + options + " cannot be used together");
  }
  setting = value;
}

void setAction(Options& options, Action action) {
  setOnce(options.action, action, "'--schema' and '--self-test'");
}

void setOutput(Options& options, Output output) {
  setOnce(options.output, output, "'--quiet' and '--summary'");
}

std::string typeNamed(std::string_view name, std::string_view others) {
  if (recordType(name) != nullptr || (!others.empty() && name == kAutoType))
    return {name.begin(), name.end()};
  std::string message = "not a valid type: " + inQuotes(name) + "; expected";
  for (const RecordType& type : recordTypes()) message.append(" ").append(type.name);
  throw UsageError(message.append(others));
}

Format formatNamed(std::string_view name) {
  if (name == "text") return Format::text;
  if (name == "json") return Format::json;
  throw UsageError("not a valid format: " + inQuotes(name) + "; expected text json");
}

using Value = std::string_view;

struct KnownOption {
  const char* name;
  char letter;  // 0: none
  bool hasValue;
  void (*set)(Options&, Value);
};
constexpr KnownOption kKnown[] = {
    {"type", 0, true,
     [](Options& o, Value v) { o.type = typeNamed(v, " auto"), o.typeGiven = true; }},
    {"format", 0, true, [](Options& o, Value v) { o.format = formatNamed(v); }},
    {"exact-integers", 0, false, [](Options& o, Value) { o.integers = Integers::strings; }},
    {"strict", 0, false, [](Options& o, Value) { o.strict = true; }},
    {"recursive", 'r', false, [](Options& o, Value) { o.recursive = true; }},
    {"files-from", 0, true, [](Options& o, Value v) { o.filesFrom = v; }},
    {"summary", 0, false, [](Options& o, Value) { setOutput(o, Output::summary); }},
    {"quiet", 'q', false, [](Options& o, Value) { setOutput(o, Output::nothing); }},
    {"service", 0, true, [](Options& o, Value v) { o.service = v; }},
    {"schema", 0, true,
     [](Options& o, Value v) { setAction(o, Action::showSchema), o.schema = typeNamed(v, ""); }},
    {"self-test", 0, false, [](Options& o, Value) { setAction(o, Action::selfTest); }},
    {"help", 'h', false, [](Options& o, Value) { o.action = Action::showHelp; }},
    {"version", 0, false, [](Options& o, Value) { o.action = Action::showVersion; }},
};
constexpr int kFirstCode = 256;  // getopt's code of the first row; above all letters

void checkFiles(Options& options) {
  const bool none = options.files.empty() && options.filesFrom.empty();
  if (options.action == Action::unpack) {
    if (none) options.files.emplace_back(kStandardInput);
  } else if (!none) {
    const char* const name = options.action == Action::selfTest ? "self-test" : "schema";
    throw UsageError(std::string("unexpected file beside option '--") + name + '\'');
  }
}

/// Sets the option that getopt has found. `code` is getopt's result, `last` the last argument that
/// it consumed.
void take(Options& options, int code, const char* last) {
  const Value value = ::optarg == nullptr ? "" : ::optarg;
  const int subject = code == '?' || code == ':' ? ::optopt : code;
  const auto* const known =
      std::find_if(std::begin(kKnown), std::end(kKnown), [&](const auto& row) {
        return subject == row.letter || subject == kFirstCode + (&row - kKnown);
      });
  if (code == 1) {
    options.files.emplace_back(value);
  } else if (known == std::end(kKnown) || subject == 0) {
    throw UsageError("not a valid option: " +
                     inQuotes(subject == 0 ? last : std::string{'-', static_cast<char>(subject)}));
  } else if (code == '?') {
    throw UsageError("unexpected value in " + inQuotes(last));
  } else if (known->hasValue && value.empty()) {
    throw UsageError("missing value of option '--" + std::string(known->name) + '\'');
  } else {
    known->set(options, value);
  }
}

}  // namespace

Options parseOptions(std::span<const char* const> arguments) {
  std::vector<option> known;
  std::string letters = "-:";  // `-`: return files in order; `:`: return ':' for missing values
  for (const KnownOption& row : kKnown) {
    const int code = kFirstCode + static_cast<int>(known.size());
    known.push_back({row.name, row.hasValue ? required_argument : no_argument, nullptr, code});
    if (row.letter != 0) letters += row.letter;
  }
  known.push_back({});
  std::vector<char*> argv = {const_cast<char*>("")};  // getopt_long() does not write to them
  for (const char* argument : arguments) argv.push_back(const_cast<char*>(argument));
  argv.push_back(nullptr);
  const int count = static_cast<int>(argv.size()) - 1;
  const auto getopt = [&] {
    return ::getopt_long(count, argv.data(), letters.c_str(), known.data(), nullptr);  // NOLINT
  };
  Options options;
  ::opterr = 0;
  ::optind = 0;  // resets glibc's getopt
  for (int code = getopt(); code >= 0; code = getopt()) {
    take(options, code, argv[static_cast<std::size_t>(::optind) - 1]);
    if (options.action == Action::showHelp || options.action == Action::showVersion) return options;
  }
  options.files.insert(options.files.end(), argv.begin() + ::optind, argv.end() - 1);
  checkFiles(options);
  return options;
}

}  // namespace ironmoat::inspect
