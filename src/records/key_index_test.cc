#include "records/key_index.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <latch>
#include <string>
#include <thread>
#include <vector>

#include "records/message_payload.h"

namespace ironmoat::records {
namespace {

using Keys = VeskCorvelProtocolPayload::CodingKeys;

/// Every key and what differs from one by case, a blank, a prefix or a doubled end.
std::vector<std::string> keysAndNearMisses() {
  std::vector<std::string> texts = {"", " ", std::string(1, '\0'), std::string(100, 'q')};
  for (const std::string_view known : Table<VeskCorvelProtocolPayload>::rows.keys) {
    const std::string key(known);
    texts.insert(texts.end(), {key, key + " ", " " + key, key + key.back(), key + '\0',
                               key.substr(0, key.size() - 1), key.substr(1)});
    for (std::size_t i = 0; i < key.size(); ++i) {
      std::string other = key;
      const auto letter = static_cast<unsigned char>(key[i]);
      other[i] = static_cast<char>(std::islower(letter) != 0 ? std::toupper(letter)
                                                             : std::tolower(letter));
      texts.push_back(other);
    }
  }
  return texts;
}

TEST(KeyIndexTest, AnswersAsTheScanDoes) {
  ASSERT_EQ(Keys::count, 150U);
  const KeyScan scan(Table<VeskCorvelProtocolPayload>::rows.keys);
  const KeyIndex index(Table<VeskCorvelProtocolPayload>::rows.keys);
  std::size_t hits = 0;
  for (const std::string& text : keysAndNearMisses()) {
    EXPECT_EQ(index.find(text), scan.find(text)) << text;
    const auto key = Keys::fromStringValue(text);
    EXPECT_EQ(key ? key->index() : kNoKey, scan.find(text)) << text;
    hits += key ? 1 : 0;
  }
  EXPECT_GE(hits, 150U);
}

TEST(KeyIndexTest, IsBuiltOnceUnderConcurrentFirstUse) {
  // Long tables of its own, so that this is their first use.
  struct Racer {
    static const KeyIndex& index() {
      static const KeyIndex index(Table<VeskCorvelProtocolPayload>::rows.keys);
      return index;
    }
  };
  std::latch start(8);
  std::vector<const void*> seen(8);
  std::vector<std::size_t> places(8);
  {
    std::vector<std::jthread> threads;
    for (std::size_t i = 0; i < seen.size(); ++i) {
      threads.emplace_back([&, i] {
        start.arrive_and_wait();
        seen[i] = &Keys::finder();
        places[i] = Keys::fromStringValue("gdr")->index() + Racer::index().find("c");
      });
    }
  }
  EXPECT_EQ(std::count(seen.begin(), seen.end(), seen[0]), 8);
  EXPECT_EQ(std::count(places.begin(), places.end(), 149U), 8);
}

}  // namespace
}  // namespace ironmoat::records
