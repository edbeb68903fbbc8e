#include "ironmoat/values.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "values/utf8.h"

namespace ironmoat {
namespace {

TEST(Values, KeepTheirBlockUntilDetached) {
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

TEST(Values, HoldZeroBytes) {
  const std::string_view expected("a\0b", 3);
  EXPECT_EQ(Data("a\0b").view(), expected);
  EXPECT_EQ(String("a\0b").view(), expected);
  const char buffer[] = {'a', 0, 'b', 'c'};
  EXPECT_EQ(Data(buffer, 3).view(), expected);
  EXPECT_EQ(Data(std::vector<unsigned char>{'a', 0, 'b'}).view(), expected);
}

TEST(Utf8, ValidPrefixEndsBeforeTheFirstMalformedSequence) {
  const struct {
    std::string_view text;
    std::size_t valid;
  } rows[] = {
      {"plain and long enough for the wide path", 39},
      {"\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80z", 10},
      {"ab\xC0\x80", 2},
      {"x\xED\xA0\x80", 1},
      {"\xE2\x82", 0},
      {"\xC3(", 0},
      {"\xE2\x82(", 0},
      {"\xE2\x82\xC0", 0},
      {"\xF0\x9F\x98(", 0},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(validUtf8Prefix(row.text), row.valid) << testing::PrintToString(row.text);
  }
  EXPECT_THROW(String("\xff"), std::invalid_argument);
  // No overlong form, no surrogate and nothing past U+10FFFF begins with any two bytes.
  std::size_t sequences = 0;
  for (unsigned lead = 0x80; lead < 0x100; ++lead) {
    for (unsigned second = 0; second < 0x100; ++second) {
      const char text[] = {static_cast<char>(lead), static_cast<char>(second), '\x80', '\xBF'};
      sequences += validUtf8Prefix({text, 4}) >= 2 ? 1 : 0;
    }
  }
  EXPECT_EQ(sequences, 30 * 64 + (32 + 12 * 64 + 32 + 2 * 64) + (48 + 3 * 64 + 16));
}

TEST(Utf8, FindsTheFirstForeignByteOfAsciiAtEveryPosition) {
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

TEST(Utf8, WrittenCharactersAreValidAndComeBackAsUtf16) {
  for (char32_t c = 0; c < 0x110000; ++c) {
    if (c == 0xD800) c = 0xE000;
    char bytes[4];
    const std::string_view text(bytes, writeUtf8(c, bytes));
    ASSERT_TRUE(isValidUtf8(text)) << static_cast<std::uint32_t>(c);
    const std::u16string units = utf16FromUtf8(text);
    const char32_t back =
        units.size() == 1 ? units[0] : 0x10000 + ((units[0] & 0x3FFU) << 10) + (units[1] & 0x3FFU);
    ASSERT_EQ(back, c);
  }
}

}  // namespace
}  // namespace ironmoat
