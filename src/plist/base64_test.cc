#include "plist/base64.h"

#include <gtest/gtest.h>

#include <string>

#include "support/written.h"

namespace ironmoat::plist {
namespace {

std::string decoded(std::string_view text, Base64Way way = fastestBase64Way()) {
  return testing::written([&](BlockBuilder& out) {
    out.append("before:");
    const auto wrong = decodeBase64(text, out, way);
    if (wrong) out.append(" wrong at " + std::to_string(*wrong));
  });
}

TEST(Base64, DecodesStrictly) {
  const struct {
    std::string_view text;
    std::string_view expected;  // behind "before:"
  } rows[] = {
      {"", ""},
      {" Q\nU\tJ\rD Q Q = = ", "ABCA"},
      {"QQ", " wrong at 2"},
      {"QQ=", " wrong at 3"},
      {"Q", " wrong at 1"},
      {"====", " wrong at 0"},
      {"QUJD=", " wrong at 4"},
      {"QUI=Q", " wrong at 4"},
      {"QR==", " wrong at 2"},  // bits that belong to no byte
      {"QUJ=", " wrong at 3"},
      {std::string_view("QU\0D", 4), " wrong at 2"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(decoded(row.text), "before:" + std::string(row.expected)) << row.text;
    EXPECT_EQ(decoded(row.text, Base64Way::tables), "before:" + std::string(row.expected));
  }
}

TEST(Base64, RejectsForeignBytesAtEveryPosition) {
  const std::string alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  for (const std::size_t at : {0U, 5U, 16U, 31U, 47U}) {  // of what is decoded 16 at once, or not
    for (int byte = 0; byte < 256; ++byte) {
      std::string text(48, 'Q');
      text[at] = static_cast<char>(byte);
      const bool foreign = alphabet.find(text[at]) == std::string::npos;
      EXPECT_EQ(decoded(text), decoded(text, Base64Way::tables)) << at << " " << byte;
      if (std::string_view("= \t\r\n").find(text[at]) != std::string_view::npos) continue;
      const std::string wrong = "before: wrong at " + std::to_string(at);
      EXPECT_EQ(decoded(text) == wrong, foreign) << at << " " << byte;
    }
  }
}

TEST(Base64, DecodesWhatItEncodesWithWhiteSpaceAnywhere) {
  std::string bytes;
  for (std::size_t length = 0; length < 300; ++length) {
    std::string text = testing::written([&](auto& out) { encodeBase64(bytes, out); });
    EXPECT_EQ(text.size(), (length + 2) / 3 * 4);
    EXPECT_EQ(decoded(text), "before:" + bytes);
    text.insert(text.empty() ? 0 : length * 7 % text.size(), "\r\n\t");
    EXPECT_EQ(decoded(text), "before:" + bytes);
    EXPECT_EQ(decoded(text, Base64Way::tables), "before:" + bytes);
    bytes.push_back(static_cast<char>(length * 37));
  }
}

}  // namespace
}  // namespace ironmoat::plist
