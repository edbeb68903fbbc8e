#pragma once

#include <cstdint>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "inspect/json.h"

namespace ironmoat::inspect {

enum class Format : std::uint8_t { text, json };
enum class Action : std::uint8_t { unpack, showSchema, selfTest, showHelp, showVersion };
/// What the tool prints about messages.
enum class Output : std::uint8_t { each, summary, nothing };

inline constexpr std::string_view kStandardInput = "-";
/// The name that stands for trying all types.
inline constexpr std::string_view kAutoType = "auto";

struct Options {
  Action action = Action::unpack;
  std::string type = "payload";
  bool typeGiven = false;
  std::string schema;  ///< type to show; empty: none
  Format format = Format::text;
  Integers integers = Integers::numbers;  ///< in JSON
  Output output = Output::each;
  std::string service;  ///< empty: serviceProgram()
  bool recursive = false;
  bool strict = false;             ///< unknown keys are listed, and set the exit status
  std::string filesFrom;           ///< file with a list of further files; may be `-`; empty: none
  std::vector<std::string> files;  ///< `-` for standard input if the command line names none
};

/// The command line is not valid; `what()` says why, escaped for a terminal.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Parses `arguments`, which lack the program's name. Options may stand between files. Throws
/// UsageError. Not thread-safe.
Options parseOptions(std::span<const char* const> arguments);

std::string_view helpText() noexcept;

}  // namespace ironmoat::inspect
