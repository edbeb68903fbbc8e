#include "inspect/options.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace ironmoat::inspect {
namespace {

using Arguments = std::vector<const char*>;

TEST(Options, AreUnderstoodInEveryForm) {
  struct Row {
    Arguments arguments;
    std::string type;
    Format format;
    std::string service;
    std::vector<std::string> files;
  };
  const Row rows[] = {
      {{}, "payload", Format::text, "", {"-"}},
      {{"a", "-", "b"}, "payload", Format::text, "", {"a", "-", "b"}},
      {{"--type", "command-response", "a"}, "command-response", Format::text, "", {"a"}},
      {{"a", "--format=json", "--service=/s", "b"}, "payload", Format::json, "/s", {"a", "b"}},
      {{"--type=auto"}, "auto", Format::text, "", {"-"}},
      {{"--", "--type", "-x"}, "payload", Format::text, "", {"--type", "-x"}},
  };
  for (const Row& row : rows) {
    const Options options = parseOptions(row.arguments);
    EXPECT_EQ(options.action, Action::unpack);
    EXPECT_EQ(options.type, row.type);
    EXPECT_EQ(options.format, row.format);
    EXPECT_EQ(options.service, row.service);
    EXPECT_EQ(options.files, row.files);
    EXPECT_EQ(options.output, Output::each);
  }
}

TEST(Options, SayWhatToDoAndWhatToPrint) {
  struct Row {
    Arguments arguments;
    Action action;
    Output output;
    std::string schema;
  };
  const Row rows[] = {
      {{"-q", "a"}, Action::unpack, Output::nothing, ""},
      {{"--format=json", "--summary"}, Action::unpack, Output::summary, ""},
      {{"--type=auto", "--schema", "payload"}, Action::showSchema, Output::each, "payload"},
      {{"--self-test"}, Action::selfTest, Output::each, ""},
      {{"--summary", "--help", "--nonsense"}, Action::showHelp, Output::summary, ""},
      {{"--self-test", "--version"}, Action::showVersion, Output::each, ""},
  };
  for (const Row& row : rows) {
    const Options options = parseOptions(row.arguments);
    EXPECT_EQ(options.action, row.action);
    EXPECT_EQ(options.output, row.output);
    EXPECT_EQ(options.schema, row.schema);
  }
}

TEST(Options, WrongOnesAreNamed) {
  const std::pair<Arguments, std::string> rows[] = {
      {{"--colour"}, "unknown option '--colour'"},
      {{"-x"}, "unknown option '-x'"},
      {{"--type"}, "option '--type' needs a value"},
      {{"--service="}, "option '--service' needs a program"},
      {{"--format", "xml"}, "unknown format 'xml': text or json"},
      {{"--type", "\x1B[2J"},
       "unknown type '\\u{1b}[2J': one of command-response, web-tunnel-response, payload, auto"},
      {{"--schema=auto"},
       "unknown type 'auto': one of command-response, web-tunnel-response, payload"},
      {{"--schema=payload", "--self-test"},
       "options '--schema' and '--self-test' exclude one another"},
      {{"a", "--schema", "payload"}, "option '--schema' goes without files"},
      {{"--self-test", "a"}, "option '--self-test' goes without files"},
      {{"-", "-"}, "standard input can be read only once"},
  };
  for (const auto& [arguments, message] : rows) {
    try {
      parseOptions(arguments);
      ADD_FAILURE() << message;
    } catch (const UsageError& error) {
      EXPECT_EQ(error.what(), message);
    }
  }
}

}  // namespace
}  // namespace ironmoat::inspect
