#include "inspect/options.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace ironmoat::inspect {
namespace {

using Arguments = std::vector<const char*>;

TEST(Options, AreUnderstoodInEveryForm) {
  const struct {
    Arguments arguments;
    std::string type;
    Format format;
    std::string service;
    std::vector<std::string> files;
    Action action = Action::unpack;
    Output output = Output::each;
    std::string schema = {};
  } rows[] = {
      {{}, "payload", Format::text, "", {"-"}},
      {{"a", "-", "b"}, "payload", Format::text, "", {"a", "-", "b"}},
      {{"--type", "command-response", "a"}, "command-response", Format::text, "", {"a"}},
      {{"a", "--format=json", "--service=/s", "b"}, "payload", Format::json, "/s", {"a", "b"}},
      {{"--", "--type", "-x"}, "payload", Format::text, "", {"--type", "-x"}},
      {{"-q"}, "payload", Format::text, "", {"-"}, Action::unpack, Output::nothing},
      {{"--format=json", "--summary"},
       "payload",
       Format::json,
       "",
       {"-"},
       Action::unpack,
       Output::summary},
      {{"--type=auto", "--schema", "payload"},
       "auto",
       Format::text,
       "",
       {"-"},
       Action::showSchema,
       Output::each,
       "payload"},
      {{"--self-test"}, "payload", Format::text, "", {"-"}, Action::selfTest},
      {{"--help", "--nonsense"}, "payload", Format::text, "", {}, Action::showHelp},
      {{"--self-test", "--version"}, "payload", Format::text, "", {}, Action::showVersion},
  };
  for (const auto& row : rows) {
    const Options options = parseOptions(row.arguments);
    EXPECT_EQ(options.action, row.action);
    EXPECT_EQ(options.type, row.type);
    EXPECT_EQ(options.format, row.format);
    EXPECT_EQ(options.service, row.service);
    if (row.action == Action::unpack) {
      EXPECT_EQ(options.files, row.files);
    }
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
