#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <stdexcept>

#include "plist/document_builder.h"
#include "plist/writer.h"

namespace ironmoat::plist {
namespace {

TEST(XmlWriterTest, RefusesWhatTheFormOrARecordCannotHold) {
  const std::function<void(DocumentBuilder&)> fills[] = {
      [](auto& builder) {
        builder.string({"a\0b", 3});
      },
      [](auto& builder) { builder.string("\xEF\xBF\xBF"); },
      [](auto& builder) {
        ASSERT_TRUE(builder.beginDictionary());
        builder.string("\x1F");
        builder.boolean(true);
        builder.end();
      },
      [](auto& builder) { builder.opaque(Kind::real); },
      [](auto& builder) { builder.opaque(Kind::wideInteger); },
  };
  for (const auto& fill : fills) {
    Document document;
    DocumentBuilder builder(document, {}, Sharing::anyThread);
    fill(builder);
    builder.finish();
    EXPECT_THROW((void)writeXml(document), std::invalid_argument);
  }
}

}  // namespace
}  // namespace ironmoat::plist
