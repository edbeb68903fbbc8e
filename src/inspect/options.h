#pragma once

#include <cstdint>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace ironmoat::inspect {

enum class Format : std::uint8_t { text, json };
enum class Action : std::uint8_t { unpack, selfTest, showHelp, showVersion };

inline constexpr std::string_view kStandardInput = "-";

struct Options {
  Action action = Action::unpack;
  std::string type = "payload";
  Format format = Format::text;
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
