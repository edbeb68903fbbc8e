#pragma once

#include <cstdint>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace ironmoat::inspect {

enum class Format : std::uint8_t { text, json };
enum class Action : std::uint8_t { unpack, showSchema, selfTest, showHelp, showVersion };
/// What is printed of the messages.
enum class Output : std::uint8_t { each, summary, nothing };

inline constexpr std::string_view kStandardInput = "-";
/// Instead of a type's name: all are tried.
inline constexpr std::string_view kAutoType = "auto";

struct Options {
  Action action = Action::unpack;
  std::string type = "payload";
  bool typeGiven = false;
  std::string schema;  ///< of which type to show it
  Format format = Format::text;
  Output output = Output::each;
  std::string service;             ///< empty: to be found
  std::vector<std::string> files;  ///< never empty to unpack; `-` at most once
};

/// The command line cannot be understood; `what()` says what of it, in words fit for a terminal.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// `arguments` without the program's name. Options may stand between files and have their value in
/// the same or the next argument; what follows `--` is files. Throws UsageError.
Options parseOptions(std::span<const char* const> arguments);

std::string_view helpText() noexcept;

}  // namespace ironmoat::inspect
