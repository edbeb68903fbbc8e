#include "inspect/options.h"

#include <algorithm>
#include <array>
#include <optional>

#include "inspect/record_types.h"
#include "inspect/text_view.h"

namespace ironmoat::inspect {

namespace {

void setAction(Options& options, Action action) {
  if (options.action != Action::unpack && options.action != action) {
    throw UsageError("options '--schema' and '--self-test' exclude one another");
  }
  options.action = action;
}

void setOutput(Options& options, Output output) {
  if (options.output != Output::each && options.output != output) {
    throw UsageError("options '--quiet' and '--summary' exclude one another");
  }
  options.output = output;
}

[[noreturn]] void refuseType(std::string_view name, std::string_view others) {
  std::string known;
  for (const RecordType& type : recordTypes()) {
    if (!known.empty()) known += ", ";
    known += type.name;
  }
  throw UsageError("unknown type " + inQuotes(name) + ": one of " + known.append(others));
}

void setType(Options& options, std::string_view name) {
  if (name != kAutoType && recordType(name) == nullptr) refuseType(name, ", auto");
  options.type = name;
  options.typeGiven = true;
}

void setSchema(Options& options, std::string_view name) {
  setAction(options, Action::showSchema);
  if (recordType(name) == nullptr) refuseType(name, "");
  options.schema = name;
}

void setFormat(Options& options, std::string_view name) {
  if (name != "text" && name != "json") {
    throw UsageError("unknown format " + inQuotes(name) + ": text or json");
  }
  options.format = name == "text" ? Format::text : Format::json;
}

void setService(Options& options, std::string_view program) {
  if (program.empty()) throw UsageError("option '--service' needs a program");
  options.service = program;
}

struct Flag {
  std::string_view name;
  void (*set)(Options&);
};
constexpr std::array kFlags = {
    Flag{"--quiet", [](Options& options) { setOutput(options, Output::nothing); }},
    Flag{"-q", [](Options& options) { setOutput(options, Output::nothing); }},
    Flag{"--summary", [](Options& options) { setOutput(options, Output::summary); }},
    Flag{"--self-test", [](Options& options) { setAction(options, Action::selfTest); }},
    Flag{"--help", [](Options& options) { options.action = Action::showHelp; }},
    Flag{"-h", [](Options& options) { options.action = Action::showHelp; }},
    Flag{"--version", [](Options& options) { options.action = Action::showVersion; }},
};

struct Setting {
  std::string_view name;
  void (*set)(Options&, std::string_view value);
};
constexpr std::array kSettings = {
    Setting{"--type", setType},
    Setting{"--format", setFormat},
    Setting{"--service", setService},
    Setting{"--schema", setSchema},
};

/// What stands after `name` and '=' in `argument`, if that is `name=value`.
std::optional<std::string_view> valueIn(std::string_view argument, std::string_view name) {
  if (!argument.starts_with(name) || argument.substr(name.size(), 1) != "=") return std::nullopt;
  return argument.substr(name.size() + 1);
}

/// Sets what `argument` asks for, with the first of `rest` for its value where it has none in
/// itself; returns how many of those it took.
std::size_t takeOption(Options& options, std::string_view argument,
                       std::span<const char* const> rest) {
  for (const Flag& flag : kFlags) {
    if (argument == flag.name) return flag.set(options), 0;
  }
  for (const Setting& setting : kSettings) {
    if (const auto value = valueIn(argument, setting.name)) return setting.set(options, *value), 0;
    if (argument != setting.name) continue;
    if (rest.empty()) throw UsageError("option " + inQuotes(argument) + " needs a value");
    return setting.set(options, rest.front()), 1;
  }
  throw UsageError("unknown option " + inQuotes(argument));
}

void checkFiles(Options& options) {
  if (options.action != Action::unpack) {
    const char* name = options.action == Action::selfTest ? "--self-test" : "--schema";
    if (!options.files.empty()) throw UsageError("option " + inQuotes(name) + " goes without files");
    return;
  }
  if (options.files.empty()) options.files.emplace_back(kStandardInput);
  if (std::count(options.files.begin(), options.files.end(), kStandardInput) > 1) {
    throw UsageError("standard input can be read only once");
  }
}

}  // namespace

Options parseOptions(std::span<const char* const> arguments) {
  Options options;
  bool onlyFiles = false;
  for (std::size_t i = 0; i < arguments.size(); ++i) {
    const std::string_view argument = arguments[i];
    if (onlyFiles || argument == kStandardInput || !argument.starts_with('-')) {
      options.files.emplace_back(argument);
    } else if (argument == "--") {
      onlyFiles = true;
    } else {
      i += takeOption(options, argument, arguments.subspan(i + 1));
      if (options.action == Action::showHelp || options.action == Action::showVersion) {
        return options;
      }
    }
  }
  checkFiles(options);
  return options;
}

}  // namespace ironmoat::inspect
