#include "inspect/options.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace ironmoat::inspect {
namespace {

/// The options that differ from the default, or the error.
std::string parsed(const std::vector<const char*>& arguments) {
  try {
    const Options options = parseOptions(arguments);
    std::string out = options.typeGiven ? options.type + " given" : options.type;
    static constexpr const char* kActions[] = {"", " schema ", " self-test", " help", " version"};
    static constexpr const char* kOutputs[] = {"", " summary", " quiet"};
    out += kActions[static_cast<int>(options.action)] + options.schema;
    if (options.format == Format::json) out += " json";
    if (options.integers == Integers::strings) out += " exact";
    out += kOutputs[static_cast<int>(options.output)];
    if (options.strict) out += " strict";
    if (options.recursive) out += " recursive";
    if (!options.service.empty()) out += " service " + options.service;
    if (!options.filesFrom.empty()) out += " from " + options.filesFrom;
    for (const std::string& file : options.files) out += " [" + file + ']';
    return out;
  } catch (const UsageError& error) {
    return error.what();
  }
}

TEST(Options, AreParsedOrRejectedWithTheirName) {
  const std::pair<std::vector<const char*>, std::string> rows[] = {
      {{}, "payload [-]"},
      {{"a", "-", "b"}, "payload [a] [-] [b]"},
      {{"--type", "command-response", "a"}, "command-response given [a]"},
      {{"a", "--format=json", "--service=/s", "b"}, "payload json service /s [a] [b]"},
      {{"--type=payload", "--", "--type", "-x"}, "payload given [--type] [-x]"},
      {{"-q"}, "payload quiet [-]"},
      {{"-rq", "--quiet", "a"}, "payload quiet recursive [a]"},
      {{"--recursive", "--files-from=-", "--exact-integers", "--strict"},
       "payload exact strict recursive from -"},
      {{"a", "--files-from", "l"}, "payload from l [a]"},
      {{"--format=json", "--summary", "--format=text"}, "payload summary [-]"},
      {{"--type=auto", "--schema", "payload"}, "auto given schema payload"},
      {{"--self-test"}, "payload self-test"},
      {{"--help", "--nonsense"}, "payload help"},
      {{"-qh"}, "payload help quiet"},
      {{"--self-test", "--version"}, "payload version"},

      {{"--colour"}, "not a valid option: '--colour'"},
      {{"--s"}, "not a valid option: '--s'"},
      {{"a", "-qtr"}, "not a valid option: '-t'"},
      {{"--quiet=x"}, "unexpected value in '--quiet=x'"},
      {{"--type"}, "missing value of option '--type'"},
      {{"--service="}, "missing value of option '--service'"},
      {{"--files-from", ""}, "missing value of option '--files-from'"},
      {{"--format", "xml"}, "not a valid format: 'xml'; expected text json"},
      {{"--type", "\x1B[2J"},
       "not a valid type: '\\u{1b}[2J'; expected command-response web-tunnel-response payload "
       "auto"},
      {{"--schema=auto"},
       "not a valid type: 'auto'; expected command-response web-tunnel-response payload"},
      {{"--schema=payload", "--self-test"},
       "options '--schema' and '--self-test' cannot be used together"},
      {{"-q", "--summary"}, "options '--quiet' and '--summary' cannot be used together"},
      {{"a", "--schema", "payload"}, "unexpected file beside option '--schema'"},
      {{"--self-test", "--files-from=l"}, "unexpected file beside option '--self-test'"},
  };
  for (const auto& [arguments, expected] : rows) EXPECT_EQ(parsed(arguments), expected);
}

}  // namespace
}  // namespace ironmoat::inspect
