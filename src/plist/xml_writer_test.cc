#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <limits>
#include <stdexcept>
#include <string>

#include "plist/document_builder.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "support/show_document.h"

namespace ironmoat::plist {
namespace {

using Fill = std::function<void(DocumentBuilder&)>;

std::string written(const Fill& fill) {
  Document document;
  DocumentBuilder builder(document, {}, Sharing::anyThread);
  fill(builder);
  builder.finish();
  const Data message = writeXml(document);
  Document readBack;
  readXml(message, readBack);
  EXPECT_EQ(show(readBack), show(document));
  return std::string(message.view());
}

TEST(XmlWriterTest, WritesOneElementALine) {
  const std::string text = written([](DocumentBuilder& builder) {
    builder.beginDictionary();
    builder.string("list");
    builder.beginArray();
    builder.boolean(true);
    builder.boolean(false);
    builder.integer(std::numeric_limits<std::int64_t>::min());
    builder.beginDictionary();
    builder.end();
    builder.beginArray();
    builder.end();
    builder.end();
    builder.string("a<&>b");
    builder.string(" \r\n\t]]>\"' \xF0\x9F\x98\x80");
    builder.string("");
    builder.data(std::string_view("\0\xff\x10\x80", 4));
    builder.end();
  });
  EXPECT_EQ(text, R"(<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0">
<dict>
	<key>list</key>
	<array>
		<true/>
		<false/>
		<integer>-9223372036854775808</integer>
		<dict/>
		<array/>
	</array>
	<key>a&lt;&amp;&gt;b</key>
	<string> &#13;
	]]&gt;"' )"
                  "\xF0\x9F\x98\x80"
                  R"(</string>
	<key></key>
	<data>AP8QgA==</data>
</dict>
</plist>
)");
}

TEST(XmlWriterTest, RefusesWhatTheFormOrARecordCannotHold) {
  const auto inKey = [](DocumentBuilder& builder) {
    builder.beginDictionary();
    builder.string("\x1F");
    builder.boolean(true);
    builder.end();
  };
  for (const Fill& fill : {
           Fill([](auto& builder) {
             builder.string({"a\0b", 3});
           }),
           Fill([](auto& builder) { builder.string("\xEF\xBF\xBF"); }),
           Fill(inKey),
           Fill([](auto& builder) { builder.opaque(Kind::real); }),
           Fill([](auto& builder) { builder.unsignedInteger(~std::uint64_t{0}); }),
       }) {
    EXPECT_THROW(written(fill), std::invalid_argument);
  }
}

}  // namespace
}  // namespace ironmoat::plist
