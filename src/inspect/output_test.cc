#include <gtest/gtest.h>

#include <string>

#include "inspect/json.h"
#include "inspect/position.h"
#include "inspect/terminal_text.h"
#include "ironmoat/values.h"
#include "values/utf8.h"

namespace ironmoat::inspect {

namespace {

using namespace std::literals;

TEST(Text, IsEscapedWhenItWouldControlATerminal) {
  const struct {
    std::string_view text;
    std::string terminal;
    std::string json;
  } rows[] = {
      {"\xC3\xA9\xE6\xBC\xA2\xF0\x9F\x98\x80", "\xC3\xA9\xE6\xBC\xA2\xF0\x9F\x98\x80",
       "\xC3\xA9\xE6\xBC\xA2\xF0\x9F\x98\x80"},
      {"\"quoted\" \\", "\"quoted\" \\", R"(\"quoted\" \\)"},
      {"\n\r\t\b", R"(\n\r\t\u{8})", R"(\n\r\t\u0008)"},
      {"\0\x0F\x10\x1B]0;title\x7F"sv, R"(\u{0}\u{f}\u{10}\u{1b}]0;title\u{7f})",
       R"(\u0000\u000f\u0010\u001b]0;title\u007f)"},
      {"\xC2\x80\xC2\x9B\x32J\xC2\x9F\xC2\xA0", "\\u{80}\\u{9b}2J\\u{9f}\xC2\xA0",
       "\\u0080\\u009b2J\\u009f\xC2\xA0"},
      {"\xE2\x80\xA8\xE2\x80\xA9", R"(\u{2028}\u{2029})", R"(\u2028\u2029)"},
      // Invisible characters, and changes of the reading direction.
      {"\xE2\x80\xAE\x66\xE2\x80\x8B\xEF\xBB\xBF\xF3\xA0\x81\x81",
       R"(\u{202e}f\u{200b}\u{feff}\u{e0041})",
       "\xE2\x80\xAE\x66\xE2\x80\x8B\xEF\xBB\xBF\xF3\xA0\x81\x81"},
      {"a\xFF\xC3", R"(a\x{ff}\x{c3})", "a\xEF\xBF\xBD\xEF\xBF\xBD"},
      {"\xE2\x82z", R"(\x{e2}\x{82}z)", "\xEF\xBF\xBD\xEF\xBF\xBDz"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(inQuotes(row.text), '\'' + row.terminal + '\'');
    std::string json;
    JsonWriter(json).value(row.text);
    EXPECT_EQ(json, '"' + row.json + '"');
  }
}

TEST(Text, HasTheColumnsAndEscapesOfItsCharacters) {
  std::uint64_t columns = 0;  // times the character
  std::uint64_t escaped = 0;
  for (char32_t c = 0x80; c < 0x110000; ++c) {
    if (c == 0xD800) c = 0xE000;
    char bytes[4];
    const std::string_view text(bytes, writeUtf8(c, bytes));
    columns += c * columnsOf(text);
    if (inQuotes(text).size() != text.size() + 2) escaped += c;
  }
  EXPECT_EQ(columns, 647955388017U);
  EXPECT_EQ(escaped, 3766972289U);
}

TEST(Text, IsWrappedAtLastSpaceThatFits) {
  const struct {
    std::string_view text;
    std::size_t width;
    std::string_view expected;
  } rows[] = {
      {"one\ntwo\nthree", 0, "one two three"},
      {"one\ntwo\nthree", 18, "one two three"},  // in column 5
      {"one\ntwo\nthree", 17, "one two\n  three"},
      {"a\ntwo\nthree", 7, "a\n  two\n  three"},
      {"a b\nabcdefgh", 8, "a b\n  abcdef\n  gh"},
      {"\xE6\xBC\xA2\xE6\xBC\xA2\ne\xCC\x81", 11, "\xE6\xBC\xA2\xE6\xBC\xA2 e\xCC\x81"},
      {"\033[2mone\033[0m\ntwo", 12, "\033[2mone\033[0m two"},
  };
  for (const auto& row : rows) {
    std::string out;
    appendWrapped(out, row.text, 5, 2, row.width);
    EXPECT_EQ(out, row.expected);
  }
}

std::string position(std::string_view message, std::uint64_t offset, std::size_t width = 60) {
  std::string out;
  appendPosition(out, Data(message), offset, {{}, width}, 0);
  return out;
}

TEST(Position, IsLineAndColumnOrByteAndShowsBytesThere) {
  const struct {
    std::string_view message;
    std::uint64_t offset;
    std::string_view shown;
    std::size_t width = 60;
  } rows[] = {
      {"", 0, "line 1, column 1, the end\n"},
      {"abc", 4, ""},
      {"ab\n \t<c>\n", 5, "line 2, column 3\n  <c>\n  ^\n"},
      {"ab\n \t<c>\n", 9, "line 3, column 1, the end\n"},
      {"a\r\nb\rc\nd", 7, "line 4, column 1\n  d\n  ^\n"},
      {"\xEF\xBB\xBF\xC3\xA9\t\xE6\xBC\xA2x", 9,
       "line 1, column 4\n  \xC3\xA9 \xE6\xBC\xA2x\n      ^\n"},
      {"\xEF\xBB\xBFx", 1, "line 1, column 1\n  x\n  ^\n"},
      {"\x1B[2J\xFFz", 5, "line 1, column 6\n  \\u{1b}[2J\\x{ff}z\n                 ^\n"},
      {"\x80\x80", 1, "line 1, column 1\n  \\x{80}\\x{80}\n        ^\n"},
      {"\xFE\xFF\0\n\xD8\x3D\xDE\x00\0<\0>"sv, 8,
       "line 2, column 2\n  \xF0\x9F\x98\x80<>\n    ^\n"},
      {"\xFE\xFF\0<"sv, 0, "line 1, column 1\n  <\n  ^\n"},
      {"\xFE\xFF\0\x80\0x"sv, 4, "line 1, column 2\n  \\u{80}x\n        ^\n"},
      // Halves of surrogate pairs, and half a UTF-16 unit.
      {"\xFE\xFF\xDC\0\xDC\0"sv, 6,
       "line 1, column 3, the end\n  \xEF\xBF\xBD\xEF\xBF\xBD\n    ^\n"},
      {"\xFE\xFF\xD8\0\xD8\0"sv, 4, "line 1, column 2\n  \xEF\xBF\xBD\xEF\xBF\xBD\n   ^\n"},
      {"\xFF\xFE<\0>\0\n"sv, 4, "line 1, column 2\n  <>\xEF\xBF\xBD\n   ^\n"},
      {"bplist00\xD1\x01\x02QaQb"sv, 9,
       "byte 9 of 15\n  30 30 d1 01 02 51  |00...Q|\n           ^^\n", 30},
      {"bplist00~\x7F"sv, 0, "byte 0 of 10\n  62 70 6c 69 73 74 30 30 7e 7f  |bplist00~.|\n  ^^\n"},
  };
  for (const auto& row : rows) EXPECT_EQ(position(row.message, row.offset, row.width), row.shown);
}

TEST(Position, ShowsPartOfLineThatFitsWhenLineIsLong) {
  const std::string line = std::string(1000, 'a') + "!" + std::string(1000, 'b');
  EXPECT_EQ(position(line, 1000, 33),
            "line 1, column 1001\n  ...aaaaaaaaaaaaaaa!bbbbbbbb...\n                    ^\n");
  const std::string fits = "<a>" + std::string(19, 'b') + "<c/></a>";
  const std::string start = "line 1, column 4\n  " + fits.substr(0, 27);
  EXPECT_EQ(position(fits, 3, 33), start + "/a>\n     ^\n");
  EXPECT_EQ(position(fits + "d", 3, 33), start + "...\n     ^\n");
  std::string marks = "a";
  for (int i = 0; i < 3000; ++i) marks += "\xCC\x81";  // combining marks take no column
  for (const std::string& wide : {marks, std::string(3000, '\xF0'), std::string(3000, '\x80')}) {
    EXPECT_LT(position(wide, 2001).size(), 600U);
  }
}

}  // namespace
}  // namespace ironmoat::inspect
