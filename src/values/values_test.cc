#include "ironmoat/values.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <utility>

#include "values/block_builder.h"
#include "values/utf8.h"

namespace ironmoat {
namespace {

TEST(ValuesTest, AbsentEmptyAndPresentStayApart) {
  Optional<String> text;
  EXPECT_NE(text, Optional<String>(String()));
  text = String("");
  const Optional<String> copy = text;
  text.reset();
  EXPECT_TRUE(copy.value().empty());
  EXPECT_THROW((void)text.value(), std::bad_optional_access);
  Optional<Data> bytes = Data(std::string_view("\0\xff", 2));
  const Optional<Data> moved = std::move(bytes);
  EXPECT_EQ(moved->view(), std::string_view("\0\xff", 2));
}

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

TEST(ValuesTest, BlockBuilderGrowsAndForgets) {
  BlockBuilder builder;
  std::string expected;
  for (int i = 0; i < 5000; ++i) {
    builder.push(static_cast<char>(i));
    expected.push_back(static_cast<char>(i));
  }
  builder.truncate(4000);
  builder.append("end");
  const BlockRef block = builder.finish();
  EXPECT_EQ(std::string_view(block->bytes(), block->size()), expected.substr(0, 4000) + "end");
  EXPECT_FALSE(builder.finish());
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

  for (const char32_t codePoint : {0x24U, 0x7FFU, 0x800U, 0xFFFFU, 0x10000U, 0x10FFFFU}) {
    char buffer[4];
    EXPECT_TRUE(isValidUtf8({buffer, writeUtf8(codePoint, buffer)}));
  }
}

}  // namespace
}  // namespace ironmoat
