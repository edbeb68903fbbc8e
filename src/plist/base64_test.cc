#include "plist/base64.h"

#include <gtest/gtest.h>

#include <string>

namespace ironmoat::plist {
namespace {

std::string decoded(std::string_view text) {
  BlockBuilder out;
  out.append("before:");
  const auto wrong = decodeBase64(text, out);
  std::string result(out.bytes(), out.size());
  return wrong ? result + " wrong at " + std::to_string(*wrong) : result;
}

TEST(Base64Test, DecodesStrictly) {
  const struct {
    std::string_view text;
    std::string_view expected;  // what stands behind "before:"
  } rows[] = {
      {"", ""},
      {" Q\nU\tJ\rD Q Q = = ", "ABCA"},
      {"QQ", " wrong at 2"},
      {"QQ=", " wrong at 3"},
      {"Q", " wrong at 1"},
      {"====", " wrong at 0"},
      {"QUJD=", " wrong at 4"},
      {"QUI=Q", " wrong at 4"},
      {"QR==", " wrong at 2"},  // bits that no byte takes
      {"QUJ=", " wrong at 3"},
      {"QUJDREVGR0hJ-UJD", " wrong at 12"},
      {"QUJDREV_R0hJSktM", " wrong at 7"},
      {std::string_view("QU\0D", 4), " wrong at 2"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(decoded(row.text), "before:" + std::string(row.expected)) << row.text;
  }
}

TEST(Base64Test, EveryByteAndLengthComesBackWithWhiteSpaceAnywhere) {
  std::string bytes;
  for (int length = 0; length < 300; ++length) {
    BlockBuilder encoded;
    encodeBase64(bytes, encoded);
    const std::string text(encoded.size() == 0 ? "" : encoded.bytes(), encoded.size());
    EXPECT_EQ(text.size(), (bytes.size() + 2) / 3 * 4);
    EXPECT_EQ(decoded(text), "before:" + bytes);
    const std::size_t at = text.empty() ? 0 : static_cast<std::size_t>(length) * 7 % text.size();
    EXPECT_EQ(decoded(text.substr(0, at) + "\r\n\t" + text.substr(at)), "before:" + bytes);
    bytes.push_back(static_cast<char>(length * 37));
  }
}

}  // namespace
}  // namespace ironmoat::plist
