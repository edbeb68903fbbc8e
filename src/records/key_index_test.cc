#include "records/key_index.h"

#include <gtest/gtest.h>

#include <string>

#include "records/message_payload.h"

namespace ironmoat::records {
namespace {

TEST(KeyIndex, FindsTheKeysOfATableAndNothingElse) {
  const auto& keys = Table<VeskCorvelProtocolPayload>::rows.keys;
  const KeyScan scan(keys);
  const KeyIndex index(keys);
  const auto expectAlike = [&](const std::string& text) {
    EXPECT_EQ(index.find(text), scan.find(text)) << text;
  };
  for (const std::string& text : {std::string(), std::string(1, '\0'), std::string(100, 'q')}) {
    expectAlike(text);
  }
  for (std::size_t position = 0; position < keys.size(); ++position) {
    const std::string key(keys[position]);
    EXPECT_EQ(index.find(key), position);
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

TEST(KeyIndex, ComparesLongTextsThatFoldAlike) {
  const std::string_view keys[] = {"a long key of a table"};
  EXPECT_EQ(KeyIndex(keys).find("a long key of a table"), 0U);
  EXPECT_EQ(KeyIndex(keys).find("a long kez of a table"), kNoKey);
}

}  // namespace
}  // namespace ironmoat::records
