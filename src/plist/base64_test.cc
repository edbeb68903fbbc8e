#include "plist/base64.h"

#include <gtest/gtest.h>

#include <string>

namespace ironmoat::plist {
namespace {

std::string decoded(std::string_view text, Base64Way way = fastestBase64Way()) {
  BlockBuilder out;
  out.append("before:");
  const auto wrong = decodeBase64(text, out, way);
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
    EXPECT_EQ(decoded(row.text, Base64Way::tables), "before:" + std::string(row.expected));
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
    const std::string spaced = text.substr(0, at) + "\r\n\t" + text.substr(at);
    EXPECT_EQ(decoded(spaced), "before:" + bytes);
    EXPECT_EQ(decoded(spaced, Base64Way::tables), "before:" + bytes);
    bytes.push_back(static_cast<char>(length * 37));
  }
}

TEST(Base64Test, BothWaysJudgeEveryByteInEveryPlaceAlike) {
  const std::string good = "Vesk+/09azAZQUJDREVGR0hJSktMTU5PUFFSU1RVVldY";
  for (std::size_t place = 0; place < good.size(); ++place) {
    for (int byte = 0; byte < 256; ++byte) {
      std::string text = good;
      text[place] = static_cast<char>(byte);
      EXPECT_EQ(decoded(text), decoded(text, Base64Way::tables)) << place << " " << byte;
    }
  }
}

}  // namespace
}  // namespace ironmoat::plist
