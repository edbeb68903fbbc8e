#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <string_view>

#include "plist/xml_chars.h"
#include "support/rows.h"
#include "support/show_document.h"
#include "values/utf8.h"

namespace ironmoat::plist {
namespace {

using namespace std::string_literals;

std::string inPlist(std::string_view body) {
  return "<plist version=\"1.0\">" + std::string(body) + "</plist>";
}

std::string inUtf16(std::string_view utf8, bool bigEndian) {
  std::string bytes = bigEndian ? "\xFE\xFF" : "\xFF\xFE";
  for (const char16_t unit : utf16FromUtf8(utf8)) {
    const char high = static_cast<char>(unit >> 8);
    const char low = static_cast<char>(unit & 0xFF);
    bytes += bigEndian ? high : low;
    bytes += bigEndian ? low : high;
  }
  return bytes;
}

// What the generated messages of fuzz/model.py, with the spellings that writers use, do not have.
TEST(XmlReader, GivesTheOutcomesOfTheRowsInAllEncodings) {
  testing::forEachRow("xml_reader", [](const std::string& outcome, const std::string& message) {
    EXPECT_EQ(readOutcome(message), outcome) << message;
    const bool isMarked = (message[0] & 0x80) != 0 || message.substr(0, 2) == "\0<"s;
    if (isMarked || message.find("encoding") != std::string::npos || !isValidUtf8(message)) return;
    const std::size_t at = std::min(outcome.size(), outcome.find(" at offset "));
    const auto expectAlike = [&](auto recode) {
      std::string moved = outcome;
      if (at != outcome.size()) {
        const std::string before = message.substr(0, std::stoul(outcome.substr(at + 11)));
        moved = outcome.substr(0, at + 11) + std::to_string(recode(before).size());
      }
      EXPECT_EQ(readOutcome(recode(message)), moved) << message;
    };
    expectAlike([](const std::string& text) { return "\xEF\xBB\xBF" + text; });
    expectAlike([](const std::string& text) { return inUtf16(text, true); });
    expectAlike([](const std::string& text) { return inUtf16(text, false); });
  });
}

TEST(XmlReader, ReadsSurrogatePairsAcrossTheEndsOfTranscodedPieces) {
  for (const std::string_view filler : {"a", "\xE2\x82\xAC"}) {  // the second fills whole pieces
    for (std::size_t length = 2010; length < 2030; ++length) {
      std::string text;
      for (std::size_t i = 0; i < length; ++i) text += filler;
      text += "\xF0\x9F\x98\x80z";
      EXPECT_EQ(readOutcome(inUtf16(inPlist("<string>" + text + "</string>"), true)),
                '"' + text + '"');
    }
  }
}

// S8.
TEST(XmlReader, RejectsNestingDeeperThanTheLimit) {
  std::string arrays = "<array/>";
  for (int i = 1; i < 512; ++i) arrays = "<array>" + arrays + "</array>";
  EXPECT_EQ(readOutcome(inPlist(arrays)), std::string(512, '[') + std::string(512, ']'));
  EXPECT_EQ(readOutcome(inPlist("<array>" + arrays + "</array>")),
            "limitExceeded: nesting exceeds the limit of 512 containers");
}

TEST(XmlReader, TakesNoByteBehindTheMessageForAPair) {
  const Data more("\xFE\xFF\xD8\0\xDC\0"s);
  Document document;
  EXPECT_TRUE(readXml(Data(detail::Slice(more.slice().block(), 0, 4)), document));
}

TEST(XmlText, FindsStopsAndInvalidCharactersAtEveryPosition) {
  for (std::size_t at = 0; at < 50; ++at) {
    for (const std::size_t after : {0U, 1U, 7U, 15U, 40U}) {
      const auto text = [&](std::string_view odd) {
        const char filler = after < 8 ? 'x' : '\t';
        return std::string(at, 'x') + std::string(odd) + std::string(after, filler);
      };
      for (const char c : "<&]\r;=%'\\^\f\x0E\xBC\xDD"s) {
        const std::string found = text({&c, 1});
        const bool stops = std::string_view("<&]\r").find(c) != std::string_view::npos;
        EXPECT_EQ(findTextStop(found.data(), found.data() + found.size()) - found.data(),
                  stops ? at : at + 1 + after);
      }
      for (const auto invalid : {"\x01", "\x08", "\x0B", "\x1F", "\x80", "\xEF\xBF\xBF"}) {
        EXPECT_EQ(xmlTextPrefix(text(invalid)), at);
      }
      for (const std::string_view valid : {" ", "\n", "\r", "\x7F", "\xC2\x80", "\xEF\xBF\xBD"}) {
        EXPECT_EQ(xmlTextPrefix(text(valid)), at + valid.size() + after);
      }
    }
  }
}

TEST(XmlText, NamesHaveTheCharactersThatXmlAllows) {
  std::uint64_t first = 0;
  std::uint64_t further = 0;
  std::uint64_t sum = 0;
  for (char32_t c = 1; c < 0x110000; ++c) {
    if (c == 0xD800) c = 0xE000;
    char bytes[] = "a\0\0\0\0";
    const std::size_t length = writeUtf8(c, bytes + 1);
    if (xmlNameLength({bytes + 1, length}) == length) ++first;
    if (xmlNameLength({bytes, 1 + length}) == 1 + length) {
      ++further;
      sum += c;
    }
  }
  EXPECT_EQ(first, 971506U);
  EXPECT_EQ(further, 971506U + 127U);
  EXPECT_EQ(sum, 482650548487U + 109542U);
}

}  // namespace
}  // namespace ironmoat::plist
