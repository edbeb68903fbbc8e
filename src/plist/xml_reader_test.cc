#include <gtest/gtest.h>

#include <array>
#include <initializer_list>
#include <string>
#include <string_view>

#include "ironmoat/errors.h"
#include "plist/reader.h"
#include "plist/xml_chars.h"
#include "support/show_document.h"
#include "support/tight_message.h"
#include "values/utf8.h"

namespace ironmoat::plist {
namespace {

using namespace std::string_literals;

/// The tree that a message holds, or the sentence that it is refused with.
std::string outcome(const Data& message) {
  Document document;
  const std::optional<DecodingError> refusal = readXml(message, document);
  return refusal ? refusal->what() : show(document);
}
std::string outcome(std::string_view message) { return outcome(testing::tightMessage(message)); }

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

/// Each body, in all encodings, gives the tree.
void expectTrees(std::initializer_list<std::array<std::string_view, 2>> rows) {
  for (const auto& [text, tree] : rows) {
    const std::string message = inPlist(text);
    for (const std::string& all : {message, inUtf16(message, false), inUtf16(message, true)}) {
      EXPECT_EQ(outcome(all), tree) << text;
    }
  }
}

// How else values can be spelled is the model's; here is what it does not write.
TEST(XmlReaderTest, ReadsOddSpellings) {
  expectTrees({
      {" <array\n>\t<true/><false /> <true></true><false\t></false\r\n></array > ",
       "[true, false, true, false]"},
      {"<dict><key>a</key><dict></dict><key/><string/><key></key><array><dict/></array><key>a</key>"
       "<string></string></dict>",
       R"({"a": {}, "": "", "": [{}], "a": ""})"},
      {"<!-- - --><?a?><array><!----><?b c?d?><true/><?ab-1 <x>?></array><!--<x>&y;]]>-->",
       "[true]"},
      {"<string>&#65;&#x00000000000000000063;&#x1F600;\x7F</string>", "\"Ac\xF0\x9F\x98\x80\x7F\""},
      {"<string>] ]] ]>]&gt;]</string>", R"("] ]] ]>]>]")"},
      {"<string>a<![CDATA[<b>&amp;]]]]><![CDATA[>]]>c<![CDATA[]]></string>", R"("a<b>&amp;]]>c")"},
      {"<string>a\r\nb\rc\r\r\nd&#13;\n<![CDATA[a\r\nb\r]]>\n</string>",
       "\"a\nb\nc\n\nd\r\na\nb\n\n\""},
      {"<dict><key>&lt;</key><string>x</string><key>\r</key><string>&gt;</string></dict>",
       "{\"<\": \"x\", \"\n\": \">\"}"},
      {"<array><data>QU<!-- -->JD</data><data>Q&#x55;I=</data><data><![CDATA[QQ==]]></data>"
       "<integer>1<!-- -->2</integer><integer>&#51;</integer></array>",
       R"([data "ABC", data "AB", data "A", 12, 3])"},
  });
  // Pairs across the ends of the pieces in which UTF-16 is transcoded, behind ASCII and behind what
  // fills a piece to its last byte.
  for (const std::string_view filler : {"a", "\xE2\x82\xAC"}) {
    for (std::size_t length = 2010; length < 2030; ++length) {
      std::string text;
      for (std::size_t i = 0; i < length; ++i) text += filler;
      text += "\xF0\x9F\x98\x80z";
      EXPECT_EQ(outcome(inUtf16(inPlist("<string>" + text + "</string>"), true)), '"' + text + '"');
    }
  }
}

TEST(XmlReaderTest, ReadsNumbersAndDates) {
  const std::string zeros(1000, '0');
  const struct {
    std::string element;
    std::string text;
    std::string_view expected;  // empty: refused
  } rows[] = {
      {"integer", "+" + zeros + "9", "9"},
      {"integer", "-0", "0"},
      {"integer", "9223372036854775808", "wide integer"},
      {"integer", "18446744073709551616", "wide integer"},
      {"integer", "1" + zeros, "wide integer"},
      {"integer", "1" + zeros + "x", ""},
      {"integer", "-9223372036854775808", "-9223372036854775808"},
      {"integer", "-9223372036854775809", "wide integer"},
      {"integer", "-0X8000000000000000", "-9223372036854775808"},
      {"integer", "0x" + zeros + "7fffffffffffFFFF", "9223372036854775807"},
      {"integer", "-0x8000000000000001", "wide integer"},
      {"integer", "0xF" + zeros, "wide integer"},
      {"integer", "-", ""},
      {"integer", "0x", ""},
      {"integer", "1.0", ""},
      {"real", " -12.5e+3 ", "real"},
      {"real", "1e+", ""},
      {"date", " 2024-02-29T23:59:60Z\n", "date"},
      {"date", "0000-99-99T99:99:99Z", "date"},
      {"date", "2024-01-01T00:00:00", ""},
  };
  for (const auto& row : rows) {
    const std::string body = "<" + row.element + ">" + row.text + "</" + row.element + ">";
    const std::string refusal =
        "no " + row.element + " at offset " + std::to_string(21 + row.element.size() + 2);
    EXPECT_EQ(outcome(inPlist(body)), row.expected.empty() ? refusal : row.expected) << body;
  }
}

TEST(XmlReaderTest, ReadsWhatMayStandAroundTheRoot) {
  const std::string declared = "<?xml version='1.0' encoding='utf-16'?><plist><true/></plist>";
  EXPECT_EQ(outcome(inUtf16(declared, true)), "true");
  for (const std::string before : {
           "\xEF\xBB\xBF \t\r\n",
           "<?xml version = '1.1' encoding = 'utf-8' standalone = \"yes\" ?>",
           "\xEF\xBB\xBF<?xml version=\"1.0\" encoding=\"UTF-8\"?>",
           "<?xml version='1.0' standalone='no'?><!-- a --><?b c?>",
           "<?xml version='1.0' encoding='us-ascii'?>",
           "<!DOCTYPE plist>",
           "<?xmlish?> <!DOCTYPE plist SYSTEM 'a\"[>'> <!-- b -->",
           "<!DOCTYPE\n\xC3\xA9 PUBLIC \"'\" \"plist.dtd\" >",
       }) {
    for (const auto tag :
         {"<plist>", "<plist >", "<plist version='1'>", "<plist\nversion = \"\" >"}) {
      EXPECT_EQ(outcome(before + tag + "<true/></plist ><!-- a --><?b?>\n"), "true") << before;
    }
  }
}

TEST(XmlReaderTest, RefusesAndSaysWhere) {
  const struct {
    std::string text;  // '~' marks where it goes wrong
    std::string_view reason;
  } rows[] = {
      {" \n~", "unexpected end"},
      {"~hello", "no plist element"},
      {"~<Plist><true/></Plist>", "no plist element"},
      {"<plist~s><true/></plists>", "bad plist tag"},
      {"<plist version='1' ~version='1'><true/></plist>", "bad plist tag"},
      {"<plist version~><true/></plist>", "attribute without a value"},
      {"<plist version=~1><true/></plist>", "no quoted value"},
      {"<plist version='~<'><true/></plist>", "markup in a value"},
      {"<plist~/>", "plist without a value"},
      {"<plist>~</plist>", "plist without a value"},
      {"<plist><true/>~<true/></plist>", "more than one value"},
      {"<plist><true/>~x</plist>", "text outside a text element"},
      {"<plist>~&amp;<true/></plist>", "text outside a text element"},
      {"<plist><array>~<![CDATA[]]></array></plist>", "unknown element"},
      {"<plist><string~s/></plist>", "unknown element"},
      {"<plist>~< true/></plist>", "unknown element"},
      {"<plist><true ~a='1'/></plist>", "attribute"},
      {"<plist><true>~ </true></plist>", "wrong end tag"},
      {"<plist><array><true/>~</dict></plist>", "wrong end tag"},
      {"<plist><array></array~s></plist>", "wrong end tag"},
      {"<plist><string>a~</key></plist>", "wrong end tag"},
      {"<plist><dict><key>a</key>~</dict></plist>", "key without a value"},
      {"<plist><dict><key>a</key>~<key/><true/></dict></plist>", "key without a value"},
      {"<plist><dict>~<dict/></dict></plist>", "value without a key"},
      {"<plist>~<key>a</key></plist>", "key outside a dictionary"},
      {"<plist><string>\xC3\xA9\xF0\x9F\x98\x80~<string></string></plist>",
       "element inside a text element"},
      {"<plist><string>a~]]></string></plist>", "end of cdata outside of any"},
      {"<plist><string>&lt;~]]></string></plist>", "end of cdata outside of any"},
      {"<plist><string><![CDATA[a]]~", "unexpected end"},
      {"<plist><string>a<!-- --~ --></string></plist>", "two hyphens in a comment"},
      {"<plist><string>~&nbsp;</string></plist>", "unknown entity"},
      {"<plist><string>&#x~;</string></plist>", "bad reference"},
      {"<plist><string>&#1~a;</string></plist>", "bad reference"},
      {"<plist><string>~&#0;</string></plist>", "no character of xml"},
      {"<plist><string>~&#xD800;</string></plist>", "no character of xml"},
      {"<plist><string>~&#xFFFE;</string></plist>", "no character of xml"},
      {"<plist><string>~&#x110000;</string></plist>", "no character of xml"},
      {"<plist><string>~&#4294967361;</string></plist>", "no character of xml"},
      {"<plist><data>QU~*D</data></plist>", "no base64"},
      {"<plist><data>~QU&#42;D</data></plist>", "no base64"},
      {"<plist><array><data>QUJD~</array></plist>", "wrong end tag"},
      {"<plist><integer>1~&nbsp;</integer></plist>", "unknown entity"},
      {"<plist><data>QUJD~<true/></data></plist>", "element inside a text element"},
      {"<!-- --~-><plist><true/></plist>", "two hyphens in a comment"},
      {"<plist><true/></plist><!-- -~", "unexpected end"},
      {"<plist><true/></plist>~<plist/>", "something after the plist"},
      {"<?~ a?><plist><true/></plist>", "no name"},
      {"<?a~/?><plist><true/></plist>", "no white space"},
      {" ~<?xml version='1.0'?><plist><true/></plist>", "misplaced declaration"},
      {"<plist>~<?xMl a?><true/></plist>", "misplaced declaration"},
      {"<?xml version='~2.0'?><plist><true/></plist>", "unknown version"},
      {"<?xml ~encoding='UTF-8'?><plist><true/></plist>", "no version"},
      {"<?xml version~?><plist><true/></plist>", "attribute without a value"},
      {"<?xml version='1.0' standalone~?><plist><true/></plist>", "attribute without a value"},
      {"<?xml version='1.0'~encoding='UTF-8'?><plist><true/></plist>", "bad declaration"},
      {"<?xml version='1.0' standalone='~maybe'?><plist><true/></plist>", "neither yes nor no"},
      {"<!DOCTYPE plist ~[<!ENTITY a 'b'>]><plist><true/></plist>", "internal subset"},
      {"<!DOCTYPE plist PUBLIC 'a+~&' 'b'><plist><true/></plist>", "no public identifier"},
      {"<!DOCTYPE plist PUBLIC 'a'~><plist><true/></plist>", "no white space"},
      {"<!DOCTYPE plist PUBLIC ~a 'b'><plist><true/></plist>", "no quoted value"},
      {"<!DOCTYPE plist SYSTEM ~b><plist><true/></plist>", "no quoted value"},
      {"<!DOCTYPE plist SYSTEM~'b'><plist><true/></plist>", "no white space"},
      {"<!DOCTYPE ~><plist><true/></plist>", "no name"},
      {"<!DOCTYPE plist ~OTHER><plist><true/></plist>", "bad document type"},
      {"<!DOCTYPE a>~<!DOCTYPE a><plist><true/></plist>", "no plist element"},
      {"<plist><true/></plist>~\x1F", "no character of xml"},
      {"<plist><string>\xC3\xA9~\xEF\xBF\xBE</string></plist>", "no character of xml"},
  };
  for (const auto& row : rows) {
    const std::size_t at = row.text.find('~');
    const std::string message = row.text.substr(0, at) + row.text.substr(at + 1);
    const auto refusedAt = [&](std::size_t offset) {
      return std::string(row.reason) + " at offset " + std::to_string(offset);
    };
    EXPECT_EQ(outcome(message), refusedAt(at)) << row.text;
    EXPECT_EQ(outcome("\xEF\xBB\xBF" + message), refusedAt(at + 3)) << row.text;
    if (message.find("encoding") != std::string::npos) continue;
    const std::size_t at16 = inUtf16(message.substr(0, at), true).size();
    EXPECT_EQ(outcome(inUtf16(message, true)), refusedAt(at16)) << row.text;
    EXPECT_EQ(outcome(inUtf16(message, false)), refusedAt(at16)) << row.text;
  }
}

TEST(XmlReaderTest, RefusesBrokenAndUndeclaredEncodings) {
  const auto declaring = [](const std::string& name) {
    return "<?xml version='1.0' encoding='" + name + "'?><plist><string>\xC3\xA9</string></plist>";
  };
  const struct {
    std::string message;
    std::string_view reason;
    int offset;
  } rows[] = {
      {"<plist><string>\xC3</string></plist>", "no character of xml", 15},
      {"<plist><string>\xED\xA0\x80</string></plist>", "no character of xml", 15},
      {"\0<\0p"s, "no character of xml", 0},
      {declaring("US-ASCII"), "not in the encoding that it declares", 56},
      {declaring("UTF-16"), "not in the encoding that it declares", 30},
      {declaring("UTF-8 "), "unknown encoding", 30},
      {inUtf16(declaring("UTF-8"), true), "not in the encoding that it declares", 62},
      {inUtf16(declaring("US-ASCII"), false), "not in the encoding that it declares", 62},
      {"\xFF\xFE", "unexpected end", 2},
      {"\xFE\xFF\0"s, "half a character", 2},
      {"\xFE\xFF\0<\xD8\0\0>"s, "half a surrogate pair", 4},
      {"\xFE\xFF\xDC\0"s, "half a surrogate pair", 2},
  };
  for (const auto& row : rows) {
    const std::string refusal =
        std::string(row.reason) + " at offset " + std::to_string(row.offset);
    EXPECT_EQ(outcome(row.message), refusal) << row.message;
  }
  // A pair is not made with what stands behind the message.
  const detail::Slice more = detail::Slice::copyOf("\xFE\xFF\xD8\0\xDC\0"s, Sharing::oneThread);
  EXPECT_EQ(outcome(Data(detail::Slice(more.block(), 0, 4))), "half a surrogate pair at offset 2");
}

TEST(XmlReaderTest, FindsStopsAndForeignCharactersWhereverTheyStand) {
  for (std::size_t at = 0; at < 50; ++at) {
    for (const std::size_t after : {0U, 1U, 7U, 15U, 40U}) {
      const auto text = [&](std::string_view odd) {
        return std::string(at, 'x') + std::string(odd) + std::string(after, '\t');
      };
      const auto stop = [&](char c) {
        const std::string found = text({&c, 1});
        return findTextStop(found.data(), found.data() + found.size()) - found.data();
      };
      const auto place = static_cast<std::ptrdiff_t>(at);
      const auto end = static_cast<std::ptrdiff_t>(at + 1 + after);
      for (const char c : {'<', '&', ']', '\r'}) EXPECT_EQ(stop(c), place);
      for (const char c : {';', '=', '%', '\'', '\\', '^', '\f', '\x0E', '\xBC', '\xDD'}) {
        EXPECT_EQ(stop(c), end);
      }
      for (const auto foreign : {"\x01", "\x08", "\x0B", "\x1F", "\x80", "\xEF\xBF\xBF"}) {
        EXPECT_EQ(xmlTextPrefix(text(foreign)), at);
      }
      for (const std::string_view good : {" ", "\n", "\r", "\x7F", "\xC2\x80", "\xEF\xBF\xBD"}) {
        EXPECT_EQ(xmlTextPrefix(text(good)), at + good.size() + after);
      }
    }
  }
}

TEST(XmlReaderTest, LiteralTextIsAViewOfTheMessage) {
  const std::string text = inPlist("<array><string>plain</string><string>&amp;</string></array>");
  const detail::Slice frame = detail::Slice::copyOf("frame" + text, Sharing::oneThread);
  Document document;
  const Data message(detail::Slice(frame.block(), 5, static_cast<std::uint32_t>(text.size())));
  ASSERT_FALSE(readXml(message, document));
  const auto elements = document.elements(document.node(document.root()));
  const detail::Slice literal = document.slice(document.node(elements[0]));
  EXPECT_EQ(literal.view(), "plain");
  EXPECT_EQ(literal.block(), frame.block());
  const detail::Slice made = document.slice(document.node(elements[1]));
  EXPECT_EQ(made.view(), "&");
  EXPECT_EQ(made.block()->sharing(), Sharing::oneThread);
}

TEST(XmlReaderTest, RefusesEveryBeginningOfAMessage) {
  const std::string whole =
      "<?xml version='1.0' encoding='UTF-8'?><!DOCTYPE plist PUBLIC 'a' 'b'><!-- c --><plist "
      "version='1.0'><dict><key>a</key><array><string>&#65;<![CDATA[b]]>]</string><data>QUJD</data>"
      "<integer>12</integer><true/><false></false></array></dict></plist>";
  EXPECT_EQ(outcome(whole), R"({"a": ["Ab]", data "ABC", 12, true, false]})");
  for (std::size_t length = 0; length < whole.size(); ++length) {
    EXPECT_NE(outcome(whole.substr(0, length)).find(" at offset "), std::string::npos) << length;
  }
}

}  // namespace
}  // namespace ironmoat::plist
