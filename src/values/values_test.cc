#include "ironmoat/values.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "values/utf8.h"

namespace ironmoat {
namespace {

TEST(ValuesTest, SlicesOutliveWhoMadeThemAndCanBeDetached) {
  String kept;
  for (const Sharing sharing : {Sharing::anyThread, Sharing::oneThread}) {
    {
      const detail::Slice whole = detail::Slice::copyOf("one message", sharing);
      kept = String(detail::Slice(whole.block(), 4, 7));
    }
    EXPECT_EQ(kept, String("message"));
  }
  const String own = kept.detached();
  kept = String();
  EXPECT_EQ(own.view(), "message");
}

TEST(ValuesTest, ZeroBytesAreBytesLikeAnyOther) {
  const std::string_view expected("a\0b", 3);
  EXPECT_EQ(Data("a\0b").view(), expected);
  EXPECT_EQ(String("a\0b").view(), expected);
  const char buffer[] = {'a', 0, 'b', 'c'};
  EXPECT_EQ(Data(buffer, 3).view(), expected);
  EXPECT_EQ(Data(std::vector<unsigned char>{'a', 0, 'b'}).view(), expected);
}

TEST(ValuesTest, TextIsAlwaysWellFormedUtf8) {
  const struct {
    std::string_view text;
    std::size_t valid;
  } rows[] = {
      {"plain and long enough for the wide path", 39},
      {"\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80z", 10},
      {"ab\xC0\x80", 2},        // over long
      {"\xE0\x9F\xBF", 0},      // over long
      {"\xF0\x8F\xBF\xBF", 0},  // over long
      {"x\xED\xA0\x80", 1},     // surrogate
      {"\xED\x9F\xBF\xEE\x80\x80", 6},
      {"\xF4\x90\x80\x80", 0},  // past U+10FFFF
      {"\xF4\x8F\xBF\xBF", 4},
      {"\xE2\x82", 0},  // truncated
      {"\x80", 0},
      {"\xC3(", 0},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(validUtf8Prefix(row.text), row.valid) << testing::PrintToString(row.text);
  }
  EXPECT_THROW(String("\xff"), std::invalid_argument);
  for (std::size_t length = 1; length <= 40; ++length) {
    std::string text(length, 'x');
    EXPECT_TRUE(isAscii(text));
    for (std::size_t at = 0; at < length; ++at) {
      text[at] = '\x80';
      EXPECT_FALSE(isAscii(text)) << length;
      EXPECT_EQ(validUtf8Prefix(text), at);
      text[at] = 'x';
    }
  }
}

}  // namespace
}  // namespace ironmoat
