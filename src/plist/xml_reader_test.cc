#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

#include "plist/xml_chars.h"
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

// The generated messages of fuzz/model.py have the spellings that writers use; these are the
// others.
TEST(XmlReader, ReadsUnusualSpellingsInAllEncodings) {
  const struct {
    std::string_view body;
    std::string_view tree;
  } rows[] = {
      {" <array\n>\t<true/><false /> <true></true><false\t></false\r\n></array > ",
       "[true, false, true, false]"},
      {"<dict><key>a</key><dict></dict><key/><string/><key></key><array><dict/></array><key>a</key>"
       "<string></string></dict>",
       R"({"a": {}, "": "", "": [{}], "a": ""})"},
      {"<!-- - --><?a?><array><!----><?b c?d?><true/><?ab-1 <x>?></array><!--<x>&y;]]>-->",
       "[true]"},
      {"<string>&#65;&#x00000000000000000063;&#x1F600;\x7F</string>", "\"Ac\xF0\x9F\x98\x80\x7F\""},
      {"<string>&#x20;&#xD7FF;&#xE000;&#xFFFD;&#x10FFFF;&#xaF;</string>",
       "\" \xED\x9F\xBF\xEE\x80\x80\xEF\xBF\xBD\xF4\x8F\xBF\xBF\xC2\xAF\""},
      {"<string>\x7F\xC2\x80\xDF\xBF\xE0\xA0\x80</string>", "\"\x7F\xC2\x80\xDF\xBF\xE0\xA0\x80\""},
      {"<string>] ]] ]>]&gt;]</string>", R"("] ]] ]>]>]")"},
      {"<string>a<![CDATA[<b>&amp;]]]]><![CDATA[>]]>c<![CDATA[]]></string>", R"("a<b>&amp;]]>c")"},
      {"<string>a\r\nb\rc\r\r\nd&#13;\n<![CDATA[a\r\nb\r]]>\n</string>",
       "\"a\nb\nc\n\nd\r\na\nb\n\n\""},
      {"<dict><key>&lt;</key><string>x</string><key>\r</key><string>&gt;</string></dict>",
       "{\"<\": \"x\", \"\n\": \">\"}"},
      {"<array><data>QU<!-- -->JD</data><data>Q&#x55;I=</data><data><![CDATA[QQ==]]></data>"
       "<integer>1<!-- -->2</integer><integer>&#51;</integer></array>",
       R"([data "ABC", data "AB", data "A", 12, 3])"},
  };
  for (const auto& [body, tree] : rows) {
    const std::string message = inPlist(body);
    for (const std::string& all : {message, inUtf16(message, false), inUtf16(message, true)}) {
      EXPECT_EQ(readOutcome(all), tree) << body;
    }
  }
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

TEST(XmlReader, ReadsNumbersAndDates) {
  const std::string zeros(1000, '0');
  const struct {
    std::string element;
    std::string_view value;  // empty: rejected
    std::vector<std::string> texts;
  } rows[] = {
      {"integer", "9", {"+" + zeros + "9"}},
      {"integer", "0", {"-0"}},
      {"integer",
       "9223372036854775807",
       {"9223372036854775807", "0x" + zeros + "7fffffffffffFFFF"}},
      {"integer", "-9223372036854775808", {"-9223372036854775808", "-0X8000000000000000"}},
      {"integer",
       "wide integer",
       {"9223372036854775808", "1" + zeros, "-9223372036854775809", "0xF" + zeros}},
      {"integer", "", {"1" + zeros + "x", "-", "0x", "1.0"}},
      {"real", "real", {" -12.5e+3 ", "1E9", ".5", "5.", "+iNF", "infinity", "nan"}},
      {"real", "", {".", "1e+", "1e5x"}},
      {"date", "date", {" 2024-02-29T23:59:60Z\n", "0000-99-99T99:99:99Z"}},
      {"date", "", {"2024-01-01T00:00:00", "2024-01-01T00:00:0/Z", "2024-01-01T00:00:0:Z"}},
  };
  for (const auto& [element, value, texts] : rows) {
    const std::string rejection = "malformed: not a valid " + element + " at offset " +
                                  std::to_string(21 + element.size() + 2);
    for (const std::string& text : texts) {
      EXPECT_EQ(readOutcome(inPlist("<" + element + ">" + text + "</" + element + ">")),
                value.empty() ? rejection : value)
          << text;
    }
  }
}

TEST(XmlReader, SkipsWhatMayStandAroundTheRoot) {
  const std::string declared = "<?xml version='1.0' encoding='utf-16'?><plist><true/></plist>";
  EXPECT_EQ(readOutcome(inUtf16(declared, true)), "true");
  for (const std::string before : {
           "\xEF\xBB\xBF \t\r\n",
           "<?xml version = '1.19' encoding = 'utf-8' standalone = \"yes\" ?>",
           "\xEF\xBB\xBF<?xml version=\"1.0\" encoding=\"UTF-8\"?>",
           "<?xml version='1.0' standalone='no'?><!-- a --><?b c?>",
           "<?xml version='1.0' encoding='us-ascii'?>",
           "<!DOCTYPE plist>",
           "<?xmlish?><?xm?><?xyl?><?aml?> <!DOCTYPE plist SYSTEM 'a\"[>'> <!-- b -->",
           "<!DOCTYPE\n\xC3\xA9 PUBLIC \"'\" \"plist.dtd\" >",
       }) {
    for (const auto tag :
         {"<plist>", "<plist >", "<plist version='1'>", "<plist\nversion = \"\" >"}) {
      EXPECT_EQ(readOutcome(before + tag + "<true/></plist ><!-- a --><?b?>\n"), "true") << before;
    }
  }
}

// One text for each branch that rejects.
TEST(XmlReader, RejectsMalformedMessagesWithReasonAndOffset) {
  const struct {
    std::string_view reason;
    std::string before;
    std::vector<std::string> texts;  // '~' marks the offset
  } rows[] = {
      {"unexpected end of message", "", {" \n~", "<plist><string><![CDATA[a]]~"}},
      {"missing plist element", "", {"~<Plist>"}},
      {"not a valid plist tag", "<plist", {"~s>"}},
      {"missing attribute value", "<plist", {" version~>"}},
      {"missing quoted value", "<plist", {" version=~1>"}},
      {"markup in an attribute value not allowed", "<plist", {" version='~<'>"}},
      {"missing value in the plist", "<plist", {"~/>", ">~</plist>"}},
      {"unexpected second value in the plist", "<plist>", {"<true/>~<true/>"}},
      {"unexpected text outside a text element", "<plist>", {"<true/>~x"}},
      {"not a valid element", "<plist>", {"<array>~<![CDATA[]]>", "<string~s/>"}},
      {"attribute not allowed", "<plist>", {"<true ~a='1'/>"}},
      {"missing end tag",
       "<plist>",
       {"<true>~ </true>", "<array><true/>~</dict>", "<array></array~s>", "<string>a~</key>",
        "<array><data>QUJD~</array>"}},
      {"missing value after a key", "<plist><dict><key>a</key>", {"~</dict>", "~<key/><true/>"}},
      {"missing key before a value", "<plist>", {"<dict>~<dict/>"}},
      {"unexpected key outside a dictionary", "<plist>", {"~<key>a</key>"}},
      {"unexpected element inside a text element",
       "<plist><string>",
       {"\x7F\xC2\x80\xC3\xA9\xDF\xBF\xE0\xA0\x80\xF0\x9F\x98\x80~<string>"}},
      {"unexpected end of CDATA", "<plist><string>", {"a~]]>", "&lt;~]]>"}},
      {"two hyphens in a comment not allowed", "", {"<plist><string>a<!-- --~ -->", "<!-- --~->"}},
      {"not a valid entity", "<plist>", {"<string>~&nbsp;", "<integer>1~&nbsp;</integer>"}},
      {"not a valid character reference", "<plist><string>", {"&#x~;", "&#1~a;", "&#xf~g;"}},
      {"not a valid XML character",
       "<plist><string>",
       {"~&#x1F;", "~&#xD800;", "~&#xDFFF;", "~&#xFFFE;", "~&#x110000;", "~&#4294967361;",
        "\xC3\xA9~\xEF\xBF\xBE"}},
      {"not a valid XML character", "<plist><true/></plist>", {"~\x1F"}},
      {"not a valid base64 text", "<plist><data>", {"QU~*D</data>", "~QU&#42;D</data>"}},
      {"unexpected content after the plist", "<plist><true/></plist>", {"~<plist/>"}},
      {"missing name", "<plist><true/></plist>", {"<?~ ?>"}},
      {"missing white space", "", {"<?a~/?>"}},
      {"unexpected XML declaration", " ", {"~<?XmL version='1.0'?>"}},
      {"not a valid XML version", "<?xml version='", {"~2.0'?>", "~1.'?>", "~1.:'?>", "~1./'?>"}},
      {"missing version", "<?xml ", {"~encoding='UTF-8'?>"}},
      {"missing attribute value",
       "<?xml version",
       {"~?>", "='1.0' encoding~?>", "='1.0' standalone~?>"}},
      {"not a valid XML declaration", "<?xml version='1.0'", {"~encoding='UTF-8'?>"}},
      {"not a valid standalone value", "<?xml version='1.0' standalone='", {"~maybe'?>"}},
      {"internal subset not allowed", "<!DOCTYPE plist ", {"~[<!ENTITY a 'b'>]>"}},
      {"not a valid character in a public identifier", "<!DOCTYPE a PUBLIC 'a+", {"~&' 'b'>"}},
      {"missing white space", "<!DOCTYPE", {" a PUBLIC 'a'~>", " plist SYSTEM~'b'>", "~plist>"}},
      {"missing quoted value", "<!DOCTYPE plist ", {"PUBLIC ~a 'b'>", "SYSTEM ~b>"}},
      {"missing name", "<!DOCTYPE ", {"~>"}},
      {"not a valid document type", "<!DOCTYPE plist ", {"~OTHER>"}},
  };
  for (const auto& row : rows) {
    for (const std::string& text : row.texts) {
      const std::string before = row.before + text.substr(0, text.find('~'));
      const std::string message = before + text.substr(text.find('~') + 1);
      const auto rejected = [&](std::size_t offset) {
        return "malformed: " + std::string(row.reason) + " at offset " + std::to_string(offset);
      };
      EXPECT_EQ(readOutcome(message), rejected(before.size())) << message;
      EXPECT_EQ(readOutcome("\xEF\xBB\xBF" + message), rejected(before.size() + 3)) << message;
      if (message.find("encoding=") != std::string::npos) continue;
      for (const bool bigEndian : {false, true}) {
        EXPECT_EQ(readOutcome(inUtf16(message, bigEndian)),
                  rejected(inUtf16(before, bigEndian).size()))
            << message;
      }
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

TEST(XmlReader, RejectsBytesThatAreNotInTheirEncoding) {
  const auto declaring = [](const std::string& name) {
    return "<?xml version='1.0' encoding='" + name + "'?><plist><string>\xC3\xA9</string></plist>";
  };
  const std::string notUtf16 = "encoding not allowed: the message is not in UTF-16";
  const std::string isUtf16 = "encoding not allowed: the message is in UTF-16";
  const struct {
    std::string message;
    std::string reason;
    int offset;
  } rows[] = {
      {"<plist><string>\xC3</string></plist>", "not a valid XML character", 15},
      {"<plist><string>\xED\xA0\x80</string></plist>", "not a valid XML character", 15},
      {"\0<\0p"s, "not a valid XML character", 0},
      {declaring("US-ASCII"), "not a valid US-ASCII character", 56},
      {declaring("UTF-16"), notUtf16, 30},
      {declaring("UTF-8 "), "not a valid encoding name", 30},
      {inUtf16(declaring("UTF-8"), true), isUtf16, 62},
      {inUtf16(declaring("US-ASCII"), false), isUtf16, 62},
      {"\xFF\xFE", "unexpected end of message", 2},
      {"\xFE\xFF\0"s, "missing second byte of a UTF-16 character", 2},
      {"\xFE\xFF\0<\xD8\0\0>"s, "not a valid surrogate pair", 4},
      {"\xFE\xFF\xDC\0"s, "not a valid surrogate pair", 2},
      {"\xFE\xFF\xDC\0\xDC\0"s, "not a valid surrogate pair", 2},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(readOutcome(row.message),
              "malformed: " + row.reason + " at offset " + std::to_string(row.offset));
  }
  // The bytes behind the message complete no pair.
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
