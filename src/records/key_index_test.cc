#include "records/key_index.h"

#include <gtest/gtest.h>

#include <string>

#include "records/message_payload.h"

namespace ironmoat::records {
namespace {

using Keys = VeskCorvelProtocolPayload::CodingKeys;

TEST(KeyIndexTest, AnswersAsTheScanDoes) {
  const KeyScan scan(Table<VeskCorvelProtocolPayload>::rows.keys);
  const KeyIndex index(Table<VeskCorvelProtocolPayload>::rows.keys);
  const auto expectAlike = [&](const std::string& text) {
    EXPECT_EQ(index.find(text), scan.find(text)) << text;
  };
  for (const std::string& text : {std::string(), std::string(1, '\0'), std::string(100, 'q')}) {
    expectAlike(text);
  }
  ASSERT_EQ(Keys::count, 150U);
  for (std::size_t place = 0; place < Keys::count; ++place) {
    const std::string key(Keys::at(place).stringValue());
    EXPECT_EQ(index.find(key), place);
    for (const std::string& other : {key + " ", " " + key, key + key.back(), key + '\0',
                                     key.substr(0, key.size() - 1), key.substr(1)}) {
      expectAlike(other);
    }
    for (std::size_t i = 0; i < key.size(); ++i) {
      std::string other = key;
      other[i] ^= ' ';  // the other case
      expectAlike(other);
    }
  }
}

}  // namespace
}  // namespace ironmoat::records
