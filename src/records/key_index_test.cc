#include "records/key_index.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "records/message_payload.h"

namespace ironmoat::records {
namespace {

TEST(KeyIndex, FindsTheKeysOfATableAndNothingElse) {
  const auto& keys = Table<VeskCorvelProtocolPayload>::rows.keys;
  const KeyIndex index(keys);
  std::vector<std::string> texts = {"", std::string(1, '\0'), std::string(100, 'q')};
  for (const std::string_view each : keys) {
    const std::string key(each);
    texts.insert(texts.end(), {key, key + " ", " " + key, key + key.back(), key + '\0',
                               key.substr(0, key.size() - 1), key.substr(1)});
    for (const char& c : key) {
      texts.push_back(key);
      texts.back()[static_cast<std::size_t>(&c - key.data())] ^= ' ';  // the other case
    }
  }
  for (const std::string& text : texts) {
    const auto found = std::find(keys.begin(), keys.end(), text);
    const auto place = static_cast<std::size_t>(found - keys.begin());
    EXPECT_EQ(index.find(text), found == keys.end() ? kNoKey : place) << text;
  }
}

TEST(KeyIndex, ComparesLongTextsWithTheSameEnds) {
  const std::string_view keys[] = {"a long key of a table"};
  EXPECT_EQ(KeyIndex(keys).find("a long key of a table"), 0U);
  EXPECT_EQ(KeyIndex(keys).find("a long kez of a table"), kNoKey);
}

}  // namespace
}  // namespace ironmoat::records
