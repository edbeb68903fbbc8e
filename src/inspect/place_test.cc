#include "inspect/place.h"

#include <gtest/gtest.h>

#include <string>

namespace ironmoat::inspect {
namespace {

using namespace std::literals;

std::string place(std::string_view message, std::uint64_t offset, std::size_t width = 60) {
  std::string out;
  appendPlace(out, Data(message), offset, {{}, width}, 0);
  return out;
}

TEST(Place, OfTextIsALineAndAColumnOfCharacters) {
  struct Row {
    std::string_view message;
    std::uint64_t offset;
    std::string_view shown;
  };
  const Row rows[] = {
      {"", 0, "line 1, column 1, the end\n"},
      {"ab\n \t<c>\n", 5, "line 2, column 3\n  <c>\n  ^\n"},
      {"ab\n \t<c>\n", 9, "line 3, column 1, the end\n"},
      {"a\r\nb\rc\nd", 7, "line 4, column 1\n  d\n  ^\n"},
      {"\xEF\xBB\xBF\xC3\xA9\t\xE6\xBC\xA2x", 9,
       "line 1, column 4\n  \xC3\xA9 \xE6\xBC\xA2x\n      ^\n"},
      {"\x1B[2J\xFFz", 5, "line 1, column 6\n  \\u{1b}[2J\\x{ff}z\n                 ^\n"},
      {"\xFE\xFF\0\n\xD8\x3D\xDE\x00\0<\0>"sv, 8,
       "line 2, column 2\n  \xF0\x9F\x98\x80<>\n    ^\n"},
      {"\xFF\xFE<\0>\0\n"sv, 4, "line 1, column 2\n  <>\\x{a}\n   ^\n"},
  };
  for (const Row& row : rows) EXPECT_EQ(place(row.message, row.offset), row.shown);
  EXPECT_EQ(place("abc", 4), "");
}

TEST(Place, LongLinesAreCutAroundIt) {
  const std::string line = std::string(1000, 'a') + "!" + std::string(1000, 'b');
  EXPECT_EQ(place(line, 1000, 33),
            "line 1, column 1001\n  ...aaaaaaaaaaaaaaa!bbbbbbbb...\n                    ^\n");
  EXPECT_EQ(place("<a>" + std::string(15, 'b') + "<c/></a>", 3, 33),
            "line 1, column 4\n  <a>" + std::string(15, 'b') + "<c/></a>\n     ^\n");
  std::string marks = "a";
  for (int i = 0; i < 3000; ++i) marks += "\xCC\x81";  // no columns at all
  for (const std::string& wide : {marks, std::string(3000, '\xF0')}) {
    EXPECT_LT(place(wide, 2001).size(), 400U);
  }
}

TEST(Place, OfBytesIsAnOffsetAndSomeBytesAround) {
  const std::string_view message = "bplist00\xD1\x01\x02QaQb"sv;
  EXPECT_EQ(place(message, 9, 30),
            "byte 9 of 15\n  74 30 30 d1 01 02 51 61 51\n              ^^\n");
  EXPECT_EQ(place(message, 0, 80),
            "byte 0 of 15\n"
            "  62 70 6c 69 73 74 30 30 d1 01 02 51 61 51 62  |bplist00...QaQb|\n"
            "  ^^\n");
}

}  // namespace
}  // namespace ironmoat::inspect
