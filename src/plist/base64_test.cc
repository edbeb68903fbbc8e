#include "plist/base64.h"

#include <gtest/gtest.h>

#include <string>

#include "support/written.h"

namespace ironmoat::plist {
namespace {

/// What `text` decodes to in one way.
std::string decoded(std::string_view text, Base64Way way) {
  return testing::written([&](BlockBuilder& out) {
    out.append("before:");
    const auto wrong = decodeBase64(text, out, way);
    if (wrong) out.append(" wrong at " + std::to_string(*wrong));
  });
}
void expectDecoded(std::string_view text, const std::string& expected) {
  EXPECT_EQ(decoded(text, fastestBase64Way()), "before:" + expected) << text;
  EXPECT_EQ(decoded(text, Base64Way::tables), "before:" + expected) << text;
}

TEST(Base64, DecodesStrictly) {
  const std::pair<std::string_view, std::string> rows[] = {
      {" Q\nU\tJ\rD Q Q = = ", "ABCA"}, {"QQ", " wrong at 2"},
      {"QQ=", " wrong at 3"},           {"Q", " wrong at 1"},
      {"====", " wrong at 0"},          {"QUJD=", " wrong at 4"},
      {"QUI=Q", " wrong at 4"},         {"QR==", " wrong at 2"},  // bits that belong to no byte
      {"QUJ=", " wrong at 3"},          {std::string_view("QU\0D", 4), " wrong at 2"},
  };
  for (const auto& [text, expected] : rows) expectDecoded(text, expected);
}

TEST(Base64, RejectsForeignBytesAtEveryPosition) {
  const std::string known =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/= \t\r\n";
  for (const std::size_t at : {0U, 5U, 16U, 31U, 47U}) {  // of what is decoded 16 at once, or not
    for (int byte = 0; byte < 256; ++byte) {
      std::string text(48, 'Q');
      text[at] = static_cast<char>(byte);
      if (known.find(text[at]) == std::string::npos) {
        expectDecoded(text, " wrong at " + std::to_string(at));
      } else {
        expectDecoded(text, decoded(text, Base64Way::tables).substr(7));
      }
    }
  }
}

TEST(Base64, DecodesWhatItEncodesWithWhiteSpaceAnywhere) {
  std::string bytes;
  for (std::size_t length = 0; length < 300; ++length) {
    std::string text = testing::written([&](auto& out) { encodeBase64(bytes, out); });
    EXPECT_EQ(text.size(), (length + 2) / 3 * 4);
    expectDecoded(text, bytes);
    text.insert(text.empty() ? 0 : length * 7 % text.size(), "\r\n\t");
    expectDecoded(text, bytes);
    bytes.push_back(static_cast<char>(length * 37));
  }
}

}  // namespace
}  // namespace ironmoat::plist
