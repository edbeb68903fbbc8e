#include <gtest/gtest.h>

#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>

#include "ironmoat/errors.h"
#include "ironmoat/limits.h"
#include "plist/reader.h"
#include "plist/xml_chars.h"
#include "support/show_document.h"
#include "support/tight_message.h"
#include "values/utf8.h"

namespace ironmoat::plist {
namespace {

using namespace std::string_literals;

/// The tree that a message holds, or the sentence that it is refused with.
std::string outcome(std::string_view message) {
  Document document;
  try {
    readXml(testing::tightMessage(message), document);
    return show(document);
  } catch (const DecodingError& error) {
    return error.what();
  }
}

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

struct Row {
  std::string_view text;
  std::string_view expected;
};

/// Each body, in all encodings, gives the tree.
void expectTrees(std::initializer_list<Row> rows) {
  for (const Row& row : rows) {
    const std::string message = inPlist(row.text);
    EXPECT_EQ(outcome(message), row.expected) << row.text;
    EXPECT_EQ(outcome(inUtf16(message, false)), row.expected) << row.text;
    EXPECT_EQ(outcome(inUtf16(message, true)), row.expected) << row.text;
  }
}

TEST(XmlReaderTest, ReadsEveryElement) {
  expectTrees({
      {"<dict/>", "{}"},
      {"<dict></dict>", "{}"},
      {"<array/>", "[]"},
      {" <array\n>\t<true/><false /> <true></true><false\t></false\r\n></array > ",
       "[true, false, true, false]"},
      {"<dict><key>a</key><string>b</string><key/><string/><key></key><string></string></dict>",
       R"({"a": "b", "": "", "": ""})"},
      {"<dict><key>a</key><dict><key>b</key><array><dict/></array></dict><key>a</key><true/></"
       "dict>",
       R"({"a": {"b": [{}]}, "a": true})"},
      {"<data/>", "data \"\""},
      {"<array><data> \n </data><data>QUI=</data><data>\r\n\tQ U\r\nJD\r\n</data></array>",
       R"([data "", data "AB", data "ABC"])"},
      {"<!-- - --><?a?><array><!----><?b c?d?><true/><?ab-1 <x>?></array><!--<x>&y;]]>-->",
       "[true]"},
  });
}

TEST(XmlReaderTest, ReadsText) {
  expectTrees({
      {"<string>\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80\x7F</string>",
       "\"\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80\x7F\""},
      {"<string> a &lt;&gt;&amp;&quot;&apos; </string>", R"(" a <>&\"' ")"},
      {"<string>&#65;&#x42;&#x00000000000000000063;&#xe9;&#x1F600;</string>",
       "\"ABc\xC3\xA9\xF0\x9F\x98\x80\""},
      {"<string>a<!-- b -->c<?d e?>f</string>", R"("acf")"},
      {"<string><!-- only --></string>", R"("")"},
      {"<string>] ]] ]>]&gt;]</string>", R"("] ]] ]>]>]")"},
      {"<string>a<![CDATA[<b>&amp;]]]]><![CDATA[>]]>c<![CDATA[]]></string>", R"("a<b>&amp;]]>c")"},
      {"<string>a\r\nb\rc\r\r\nd&#13;&#xD;\n</string>", "\"a\nb\nc\n\nd\r\r\n\""},
      {"<string><![CDATA[a\r\nb\rc\r]]>\n</string>", "\"a\nb\nc\n\n\""},
      {"<dict><key>&lt;</key><string>x</string><key>\r</key><string>&gt;</string></dict>",
       "{\"<\": \"x\", \"\n\": \">\"}"},
      {"<array><data>QU<!-- "
       "-->JD</data><data>Q&#x55;I=</data><data><![CDATA[QQ==]]></data></array>",
       R"([data "ABC", data "AB", data "A"])"},
      {"<array><integer>1<!-- -->2</integer><integer>&#51;</integer></array>", "[12, 3]"},
  });
}

TEST(XmlReaderTest, ReadsNumbersAndDates) {
  const std::string zeros(1000, '0');
  const struct {
    std::string element;
    std::string text;
    std::string_view expected;  // empty: refused
  } rows[] = {
      {"integer", "0", "0"},
      {"integer", " \t\r\n-17\n", "-17"},
      {"integer", "+" + zeros + "9", "9"},
      {"integer", "-0", "0"},
      {"integer", "9223372036854775807", "9223372036854775807"},
      {"integer", "9223372036854775808", "unsigned 9223372036854775808"},
      {"integer", "18446744073709551615", "unsigned 18446744073709551615"},
      {"integer", "18446744073709551616", ""},
      {"integer", "-9223372036854775808", "-9223372036854775808"},
      {"integer", "-9223372036854775809", ""},
      {"integer", "0xfF", "255"},
      {"integer", "-0X8000000000000000", "-9223372036854775808"},
      {"integer", "0x" + zeros + "ffffffffffffffff", "unsigned 18446744073709551615"},
      {"integer", "0x10000000000000000", ""},
      {"integer", "-0x8000000000000001", ""},
      {"integer", "", ""},
      {"integer", "-", ""},
      {"integer", "+-1", ""},
      {"integer", "0x", ""},
      {"integer", "0x-1", ""},
      {"integer", "1 2", ""},
      {"integer", "1a", ""},
      {"integer", "1.0", ""},
      {"integer",
       "\xC2\xA0"
       "1",
       ""},
      {"real", " -12.5e+3 ", "real"},
      {"real", ".5", "real"},
      {"real", "5.", "real"},
      {"real", "1E400", "real"},
      {"real", "-Infinity", "real"},
      {"real", "+inf", "real"},
      {"real", "NaN", "real"},
      {"real", "", ""},
      {"real", ".", ""},
      {"real", "e1", ""},
      {"real", "1e", ""},
      {"real", "1e+", ""},
      {"real", "1 e1", ""},
      {"real", "0x1p3", ""},
      {"real", "infinit", ""},
      {"date", " 2024-02-29T23:59:60Z\n", "date"},
      {"date", "2024-13-01T00:00:00Z", ""},
      {"date", "2024-00-01T00:00:00Z", ""},
      {"date", "2024-01-32T00:00:00Z", ""},
      {"date", "2024-01-01T24:00:00Z", ""},
      {"date", "2024-01-01T00:60:00Z", ""},
      {"date", "2024-01-01T00:00:61Z", ""},
      {"date", "2024-01-01T00:00:00", ""},
      {"date", "2024-01-01 00:00:00Z", ""},
      {"date", "2024-01-01T00:00:00ZZ", ""},
      {"date", "+024-01-01T00:00:00Z", ""},
      {"date", "", ""},
  };
  for (const auto& row : rows) {
    const std::string body = "<" + row.element + ">" + row.text + "</" + row.element + ">";
    const std::string refusal =
        "no " + row.element + " at offset " + std::to_string(21 + row.element.size() + 2);
    EXPECT_EQ(outcome(inPlist(body)), row.expected.empty() ? refusal : row.expected) << body;
  }
}

TEST(XmlReaderTest, ReadsWhatMayStandAroundTheRoot) {
  const std::string root = "<plist><true/></plist>";
  for (const std::string& before : {
           ""s,
           "\xEF\xBB\xBF"s,
           " \t\r\n"s,
           "<?xml version=\"1.0\"?>"s,
           "<?xml version = '1.1' encoding = 'utf-8' standalone = \"yes\" ?>"s,
           "\xEF\xBB\xBF<?xml version=\"1.0\" encoding=\"UTF-8\"?>"s,
           "<?xml version='1.0' standalone='no'?><!-- a --><?b c?>"s,
           "<?xml version='1.0' encoding='us-ascii'?>"s,
           "<!DOCTYPE plist>"s,
           "<?xmlish?> <!DOCTYPE plist SYSTEM 'a\"[>'> <!-- b -->"s,
           "<!DOCTYPE\n\xC3\xA9 PUBLIC \"'\" \"plist.dtd\" >"s,
       }) {
    EXPECT_EQ(outcome(before + root), "true") << before;
  }
  for (const std::string_view after : {" \n", "<!-- a --><?b?>\n"}) {
    EXPECT_EQ(outcome(root + std::string(after)), "true") << after;
  }
  for (const std::string_view tag :
       {"<plist >", "<plist version='1'>", "<plist\nversion = \"\" >"}) {
    EXPECT_EQ(outcome(std::string(tag) + "<true/></plist >"), "true") << tag;
  }
  const std::string declared = "<?xml version='1.0' encoding='utf-16'?>" + root;
  EXPECT_EQ(outcome(inUtf16(declared, true)), "true");
}

TEST(XmlReaderTest, RefusesAndSaysWhere) {
  const struct {
    std::string text;  // '~' marks where it goes wrong
    std::string_view reason;
  } rows[] = {
      {"~", "unexpected end"},
      {" \n~", "unexpected end"},
      {"~hello", "no plist element"},
      {"~<dict/>", "no plist element"},
      {"~<Plist><true/></Plist>", "no plist element"},
      {"<plist~s><true/></plists>", "bad plist tag"},
      {"<plist ~id='1'><true/></plist>", "bad plist tag"},
      {"<plist version='1' ~version='1'><true/></plist>", "bad plist tag"},
      {"<plist version~><true/></plist>", "attribute without a value"},
      {"<plist version=~1><true/></plist>", "no quoted value"},
      {"<plist version='~<'><true/></plist>", "markup in a value"},
      {"<plist version='~&amp;'><true/></plist>", "markup in a value"},
      {"<plist version='1~", "unexpected end"},
      {"<plist~/>", "plist without a value"},
      {"<plist>~</plist>", "plist without a value"},
      {"<plist><true/>~<true/></plist>", "more than one value"},
      {"<plist><true/></plist>~<plist><true/></plist>", "something after the plist"},
      {"<plist><true/></plist>~x", "something after the plist"},
      {"<plist><true/></plist><!-- a~", "unexpected end"},
      {"<plist><true/>~x</plist>", "text outside a text element"},
      {"<plist>~&amp;<true/></plist>", "text outside a text element"},
      {"<plist><array>~<![CDATA[]]></array></plist>", "unknown element"},
      {"<plist><array>~<set/></array></plist>", "unknown element"},
      {"<plist><string~s/></plist>", "unknown element"},
      {"<plist>~<String/></plist>", "unknown element"},
      {"<plist>~< true/></plist>", "unknown element"},
      {"<plist><true ~a='1'/></plist>", "attribute"},
      {"<plist><true~", "unexpected end"},
      {"<plist><true>~ </true></plist>", "wrong end tag"},
      {"<plist><true>~</false></plist>", "wrong end tag"},
      {"<plist><array><true/>~</dict></plist>", "wrong end tag"},
      {"<plist><dict>~</array></plist>", "wrong end tag"},
      {"<plist><array>~</plist>", "wrong end tag"},
      {"<plist><array></array~s></plist>", "wrong end tag"},
      {"<plist><string>a~</key></plist>", "wrong end tag"},
      {"<plist><true/></plist~", "unexpected end"},
      {"<plist><true/>~", "unexpected end"},
      {"<plist><dict><key>a</key>~</dict></plist>", "key without a value"},
      {"<plist><dict><key>a</key>~<key>b</key></dict></plist>", "key without a value"},
      {"<plist><dict>~<true/></dict></plist>", "value without a key"},
      {"<plist><dict>~<dict/></dict></plist>", "value without a key"},
      {"<plist>~<key>a</key></plist>", "key outside a dictionary"},
      {"<plist><array>~<key>a</key></array></plist>", "key outside a dictionary"},
      {"<plist><string>a~<b/></string></plist>", "element inside a text element"},
      {"<plist><string>\xC3\xA9\xF0\x9F\x98\x80~<string></string></plist>",
       "element inside a text element"},
      {"<plist><string>a~]]></string></plist>", "end of cdata outside of any"},
      {"<plist><string>&lt;]]~]]></string></plist>", "end of cdata outside of any"},
      {"<plist><string>]~]]></string></plist>", "end of cdata outside of any"},
      {"<plist><string><![CDATA[a]]~", "unexpected end"},
      {"<plist><string>a~", "unexpected end"},
      {"<plist><string>~&nbsp;</string></plist>", "unknown entity"},
      {"<plist><string>~& </string></plist>", "unknown entity"},
      {"<plist><string>~&LT;</string></plist>", "unknown entity"},
      {"<plist><string>&#~;</string></plist>", "bad reference"},
      {"<plist><string>&#x~;</string></plist>", "bad reference"},
      {"<plist><string>&#1~a;</string></plist>", "bad reference"},
      {"<plist><string>&#~X41;</string></plist>", "bad reference"},
      {"<plist><string>&#65~</string></plist>", "bad reference"},
      {"<plist><string>~&#0;</string></plist>", "no character of xml"},
      {"<plist><string>~&#xD800;</string></plist>", "no character of xml"},
      {"<plist><string>~&#xFFFE;</string></plist>", "no character of xml"},
      {"<plist><string>~&#x110000;</string></plist>", "no character of xml"},
      {"<plist><string>~&#4294967361;</string></plist>", "no character of xml"},
      {"<plist><data>QU~*D</data></plist>", "no base64"},
      {"<plist><data>QU~</data></plist>", "no base64"},
      {"<plist><data>~QU&#42;D</data></plist>", "no base64"},
      {"<plist><data>QUJD~", "unexpected end"},
      {"<plist><data>QUJD~<true/></data></plist>", "element inside a text element"},
      {"<!-- - ~", "unexpected end"},
      {"<!-- --~ --><plist><true/></plist>", "two hyphens in a comment"},
      {"<!-- --~-><plist><true/></plist>", "two hyphens in a comment"},
      {"~<!ELEMENT a><plist><true/></plist>", "no plist element"},
      {"<?~ a?><plist><true/></plist>", "no name"},
      {"<?a~/?><plist><true/></plist>", "no white space"},
      {"<?a b~", "unexpected end"},
      {" ~<?xml version='1.0'?><plist><true/></plist>", "misplaced declaration"},
      {"<plist>~<?xMl a?><true/></plist>", "misplaced declaration"},
      {"<?xml version='~2.0'?><plist><true/></plist>", "unknown version"},
      {"<?xml version='~1.'?><plist><true/></plist>", "unknown version"},
      {"<?xml ~encoding='UTF-8'?><plist><true/></plist>", "no version"},
      {"<?xml version='1.0'~encoding='UTF-8'?><plist><true/></plist>", "bad declaration"},
      {"<?xml version='1.0' standalone='~maybe'?><plist><true/></plist>", "neither yes nor no"},
      {"<?xml version='1.0' standalone='no' ~encoding='UTF-8'?><plist/>", "bad declaration"},
      {"<!DOCTYPE plist ~[<!ENTITY a 'b'>]><plist><true/></plist>", "internal subset"},
      {"<!DOCTYPE plist SYSTEM 'a'~[]><plist><true/></plist>", "internal subset"},
      {"<!DOCTYPE plist PUBLIC 'a'~><plist><true/></plist>", "no white space"},
      {"<!DOCTYPE plist ~OTHER><plist><true/></plist>", "bad document type"},
      {"<!DOCTYPE ~><plist><true/></plist>", "no name"},
      {"<!DOCTYPE a>~<!DOCTYPE a><plist><true/></plist>", "no plist element"},
      {"<plist><string>~\x01</string></plist>", "no character of xml"},
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
  const std::string root = "<plist><string>\xC3\xA9</string></plist>";
  const struct {
    std::string message;
    std::string_view expected;
  } rows[] = {
      {"<plist><string>\xC3</string></plist>", "no character of xml at offset 15"},
      {"<plist><string>\xED\xA0\x80</string></plist>", "no character of xml at offset 15"},
      {"<plist><string>\0</string></plist>"s, "no character of xml at offset 15"},
      {"\0<\0p"s, "no character of xml at offset 0"},
      {"<?xml version='1.0' encoding='US-ASCII'?>" + root,
       "not in the encoding that it declares at offset 56"},
      {"<?xml version='1.0' encoding='UTF-16'?>" + root,
       "not in the encoding that it declares at offset 30"},
      {"<?xml version='1.0' encoding='ISO-8859-1'?>" + root, "unknown encoding at offset 30"},
      {"<?xml version='1.0' encoding='UTF-8 '?>" + root, "unknown encoding at offset 30"},
      {inUtf16("<?xml version='1.0' encoding='UTF-8'?>" + root, true),
       "not in the encoding that it declares at offset 62"},
      {inUtf16("<?xml version='1.0' encoding='US-ASCII'?>" + root, false),
       "not in the encoding that it declares at offset 62"},
      {"\xFF\xFE", "unexpected end at offset 2"},
      {"\xFE\xFF\0"s, "half a character at offset 2"},
      {"\xFE\xFF\0<\xD8\0\0>"s, "half a surrogate pair at offset 4"},
      {"\xFE\xFF\xDC\0"s, "half a surrogate pair at offset 2"},
      {"\xFE\xFF\xD8\0"s, "half a surrogate pair at offset 2"},
      {"\xFF\xFE\0\0<\0\0\0"s, "no character of xml at offset 2"},
  };
  for (const auto& row : rows) EXPECT_EQ(outcome(row.message), row.expected) << row.message;
  // Pairs across the pieces in which UTF-16 is transcoded.
  for (std::size_t length = 990; length < 1030; ++length) {
    const std::string text = std::string(length, 'a') + "\xF0\x9F\x98\x80";
    EXPECT_EQ(outcome(inUtf16(inPlist("<string>" + text + "</string>"), true)), '"' + text + '"');
  }
}

TEST(XmlReaderTest, FindsStopsAndForeignCharactersWhereverTheyStand) {
  for (std::size_t at = 0; at < 50; ++at) {
    for (std::size_t after : {0U, 1U, 7U, 15U, 40U}) {
      const auto text = [&](std::string_view odd) {
        return std::string(at, 'x') + std::string(odd) + std::string(after, '\t');
      };
      for (const char stop : {'<', '&', ']', '\r'}) {
        const std::string found = text({&stop, 1});
        EXPECT_EQ(findTextStop(found.data(), found.data() + found.size()), found.data() + at);
      }
      for (const char other : {';', '=', '%', '\'', '\\', '^', '\f', '\x0E', '\xBC', '\xDD'}) {
        const std::string none = text({&other, 1});
        EXPECT_EQ(findTextStop(none.data(), none.data() + none.size()), none.data() + none.size());
      }
      for (const std::string_view foreign :
           {"\x01", "\x08", "\x0B", "\x1F", "\x80", "\xEF\xBF\xBF"}) {
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
  const std::string framed = "frame" + text + "frame";
  const detail::Slice frame = detail::Slice::copyOf(framed, Sharing::oneThread);
  Document document;
  {
    const Data message(detail::Slice(frame.block(), 5, static_cast<std::uint32_t>(text.size())));
    readXml(message, document);
  }
  const auto elements = document.elements(document.node(document.root()));
  EXPECT_EQ(document.text(document.node(elements[0])).data(), frame.begin() + framed.find("plain"));
  EXPECT_EQ(document.slice(document.node(elements[0])).view(), "plain");
  const detail::Slice made = document.slice(document.node(elements[1]));
  EXPECT_EQ(made.view(), "&");
  EXPECT_NE(made.block(), frame.block());
  EXPECT_EQ(made.block()->sharing(), Sharing::oneThread);
}

TEST(XmlReaderTest, RefusesContainersPastTheLimit) {
  const auto nested = [](std::size_t depth) {
    std::string text;
    for (std::size_t i = 1; i < depth; ++i) text += "<array>";
    text += "<dict/>";
    for (std::size_t i = 1; i < depth; ++i) text += "</array>";
    return inPlist(text);
  };
  EXPECT_EQ(outcome(nested(limits::nestedContainers)).front(), '[');
  Document document;
  try {
    readXml(Data(nested(limits::nestedContainers + 1)), document);
    FAIL();
  } catch (const DecodingError& error) {
    EXPECT_EQ(error.kind(), DecodingError::Kind::limitExceeded);
  }
}

TEST(XmlReaderTest, EveryBeginningOfAMessageIsRefused) {
  const std::string whole =
      "<?xml version='1.0' encoding='UTF-8'?><!DOCTYPE plist PUBLIC 'a' 'b'><!-- c --><plist "
      "version='1.0'><dict><key>a</key><array><string>&#65;<![CDATA[b]]>]</string><data>QUJD</data>"
      "<integer>12</integer><real>1</real><date>2024-01-01T00:00:00Z</date><true/><false></false>"
      "</array></dict></plist>";
  EXPECT_EQ(outcome(whole), R"({"a": ["Ab]", data "ABC", 12, real, date, true, false]})");
  for (std::size_t length = 0; length < whole.size(); ++length) {
    EXPECT_NE(outcome(whole.substr(0, length)).find(" at offset "), std::string::npos) << length;
  }
}

// Takes minutes when anything is looked at again and again; the test's time limit says so.
TEST(XmlReaderTest, TimeIsLinearInHostileMessages) {
  const auto repeated = [](std::string_view piece) {
    std::string text;
    while (text.size() < (std::size_t{4} << 20)) text += piece;
    return text;
  };
  for (const std::string_view piece :
       {"<!--", "<!-- -", "<?a ", "<a", " ", "<plist>", "<plist ", "<!DOCTYPE "}) {
    EXPECT_NE(outcome(repeated(piece)).find(" at offset "), std::string::npos);
  }
  for (const std::string_view piece : {"]", "]]", "&amp;", "&#x0", "<![CDATA[]]", "<![CDATA[", "\r",
                                       "<!-- -->", "<!--", "<?a", "<string>"}) {
    outcome("<plist><string>" + repeated(piece) + "</string></plist>");
    outcome("<plist><data>" + repeated(piece) + "</data></plist>");
  }
  EXPECT_EQ(outcome("<plist><string>&#" + repeated("0") + "65;</string></plist>"), "\"A\"");
  EXPECT_EQ(outcome("<plist><integer>" + repeated("0") + "65</integer></plist>"), "65");
  outcome("<plist><integer>0x" + repeated("f") + "</integer></plist>");
  outcome("<plist><array>" + repeated("<data>A<!-- --></data>") + "</array></plist>");
  outcome("<plist><array>" + repeated("<true/><!-- -->") + "</array></plist>");
}

}  // namespace
}  // namespace ironmoat::plist
