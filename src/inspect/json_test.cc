#include "inspect/json.h"

#include <gtest/gtest.h>

#include <string>

namespace ironmoat::inspect {
namespace {

using namespace std::literals;

TEST(Json, TextStaysTextOnOneLineAndHarmless) {
  struct Row {
    std::string_view text;
    std::string_view json;
  };
  const Row rows[] = {
      {"plain \xC3\xA9 \xE6\xBC\xA2 \xF0\x9F\x98\x80 /",
       "plain \xC3\xA9 \xE6\xBC\xA2 \xF0\x9F\x98\x80 /"},
      {"\"quoted\" \\", R"(\"quoted\" \\)"},
      {"\n\r\t\b\f", R"(\n\r\t\u0008\u000c)"},
      {"\0\x1F\x1B[31m\x7F"sv, R"(\u0000\u001f\u001b[31m\u007f)"},
      {"\xC2\x85\xC2\x9B", R"(\u0085\u009b)"},
      {"\xE2\x80\xA8\xE2\x80\xA9", R"(\u2028\u2029)"},
      // Not UTF-8, as file names may be: one replacement for each longest broken start.
      {"a\xFF\xC3", "a\xEF\xBF\xBD\xEF\xBF\xBD"},
      {"\xE2\x82z\xED\xA0\x80", "\xEF\xBF\xBDz\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD"},
      {"\xC0\xAF\xF4\x90\x80\x80",
       "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD"},
  };
  for (const Row& row : rows) {
    std::string out;
    appendJsonText(out, row.text);
    EXPECT_EQ(out, '"' + std::string(row.json) + '"');
  }
}

}  // namespace
}  // namespace ironmoat::inspect
