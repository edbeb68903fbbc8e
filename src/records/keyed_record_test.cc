// What the whole-message tests do not see: sentences, keys and values that only the binary form can
// share, and what shared values cost.

#include <gtest/gtest.h>

#include <string>
#include <unordered_set>
#include <vector>

#include "plist/encoder.h"
#include "plist/property_list_decoder.h"
#include "records/message_payload.h"
#include "support/binary_draft.h"
#include "support/refusal.h"

namespace ironmoat {
namespace {

using testing::BinaryDraft;
using Payload = VeskCorvelProtocolPayload;
using Keys = Payload::CodingKeys;

std::string outcome(const Data& message, Payload& record) {
  const auto refusal = plist::PropertyListDecoder().decode(message, record);
  return refusal ? testing::inWords(*refusal) : "accepted";
}
std::string outcome(const Data& message) {
  Payload record;
  return outcome(message, record);
}
Payload decode(const Data& message) {
  Payload record;
  EXPECT_EQ(outcome(message, record), "accepted");
  return record;
}

// S11.
TEST(KeyedRecordTest, RefusalsSayWhatIsWrongAndTheFirstInTheTableCounts) {
  const std::string c = "<key>c</key><integer>1</integer>";
  const std::string v = "<key>v</key><string/>";
  const std::string ua = "<key>ua</key><integer>1</integer>";
  const auto list = [&](const std::string& elements) {
    return c + "<key>mml</key><array>" + elements + "</array>";
  };
  const std::string firstOfTwo = "typeMismatch v: expected integer, found string";
  const struct {
    std::string entries;
    std::string outcome;
  } rows[] = {
      {c + v + ua, firstOfTwo},
      {ua + v + c, firstOfTwo},
      {v, "keyNotFound c: required key is missing"},
      {c + ua + v + "<key>v</key><integer>2</integer><key>ua</key><string/>", "accepted"},
      {list("<dict>" + list("<dict/>") + "</dict><true/>"),
       "keyNotFound mml[0].mml[0].c: required key is missing"},
      {list("<string/>"), "typeMismatch mml[0]: expected dictionary, found string"},
      {c + "<key>D</key><integer>1</integer>", "typeMismatch D: expected boolean, found integer"},
      {c + "<key>ua</key><data/>", "typeMismatch ua: expected string, found data"},
      {c + "<key>P</key><real>1</real>", "typeMismatch P: expected data, found real"},
      {c + "<key>dal</key><dict/>", "typeMismatch dal: expected array, found dictionary"},
      {c + "<key>h</key><array/>", "typeMismatch h: expected dictionary, found array"},
      {c + "<key>v</key><true/>", "typeMismatch v: expected integer, found boolean"},
      {c + "<key>v</key><date>2020-01-01T00:00:00Z</date>",
       "typeMismatch v: expected integer, found date"},
      {c + "<key>v</key><integer>9223372036854775808</integer>",
       "outOfRange v: integer does not fit in 64 bits with a sign"},
      {c + "<key>D</key><integer>9223372036854775808</integer>",
       "typeMismatch D: expected boolean, found integer"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(outcome(Data(std::string_view("<plist><dict>" + row.entries + "</dict></plist>"))),
              row.outcome);
  }
  // Only binary messages have one value under several keys, or a key as a value.
  const auto binary = [](const std::vector<std::uint64_t>& keys,
                         const std::vector<std::uint64_t>& values) {
    return BinaryDraft().dictionary(keys, values).ascii("c").ascii("v").ascii("ua").integer(1);
  };
  EXPECT_EQ(outcome(binary({1, 2, 3}, {4, 3, 4}).data()), firstOfTwo);
  EXPECT_EQ(outcome(binary({3, 2, 1}, {4, 3, 4}).data()), firstOfTwo);
  EXPECT_EQ(decode(binary({1, 1, 3}, {2, 4, 1}).data()).userAgent, String("c"));
  EXPECT_EQ(outcome(binary({1, 1}, {4, 1}).data()),
            "typeMismatch c: expected integer, found string");
}

TEST(KeyedRecordTest, EqualTextsAreWrittenOnce) {
  Payload record;
  record.userAgent = String(std::string(1000, 'x'));
  const plist::PropertyListEncoder encoder(plist::Form::binary);
  const std::size_t once = encoder.encode(record).size();
  record.httpUrl = record.userAgent;
  EXPECT_LT(encoder.encode(record).size(), once + 100);
}

// S4.
TEST(KeyedRecordTest, SharedValuesArePaidForEachTime) {
  const auto references = [](std::size_t count, std::uint64_t object) {
    return std::vector<std::uint64_t>(count, object);
  };
  BinaryDraft list;
  list.offsetSize = 4;
  list.dictionary({1, 2}, {3, 4}).ascii("c").ascii("mml").integer(1);
  // A list of many references to one small record: memory for records.
  const std::size_t most = limits::recordBytes / sizeof(Payload);
  BinaryDraft fits = list;
  fits.array(references(most, 5)).dictionary({1}, {3});
  EXPECT_EQ(decode(fits.data()).corvelMessageList->size(), most);
  BinaryDraft over = list;
  over.array(references(most + 1, 5)).dictionary({1}, {3});
  EXPECT_EQ(outcome(over.data()),
            "limitExceeded mml: lists take more memory than the limit of 67108864 bytes");
  // One megabyte of data, used 65 times: bytes delivered.
  BinaryDraft shared = list;
  shared.array(references(65, 5)).dictionary({1, 6}, {3, 7}).ascii("P");
  shared.add(BinaryDraft::head(0x40, std::size_t{1} << 20) +
             std::string(std::size_t{1} << 20, 'x'));
  EXPECT_EQ(outcome(shared.data()),
            "limitExceeded mml[64].P: text and data come to more than the limit of 67108864 bytes");
  // One dictionary of 100,000 unknown entries, scanned again and again: entries looked at.
  BinaryDraft wide = list;
  std::vector<std::uint64_t> keys = references(100'001, 6);
  keys.back() = 1;
  wide.array(references(200, 5)).dictionary(keys, references(100'001, 3)).ascii("unknown");
  EXPECT_EQ(outcome(wide.data()),
            "limitExceeded mml[83]: shared dictionaries come to more than the limit of 8388608 "
            "entries");
}

/// Decodes by hand through what the tables are decoded through.
struct ThreeFields {
  Int command = 0;
  Optional<Int> version;
  Optional<String> userAgent;

  [[nodiscard]] bool decode(const plist::Decoder& decoder) {
    const auto container = decoder.container<Keys>();
    return container && container.decode(command, Keys::of<&Payload::command>()) &&
           container.decodeIfPresent(version, Keys::of<&Payload::version>()) &&
           container.decodeIfPresent(userAgent, Keys::of<&Payload::userAgent>());
  }
};

TEST(KeyedDecodingContainerTest, RequiredEntriesMustBeThereAndOptionalOnesMayBeAbsent) {
  const auto decodeInto = [](ThreeFields& fields, std::string_view value) {
    const std::string message = "<plist>" + std::string(value) + "</plist>";
    const auto refusal =
        plist::PropertyListDecoder().decode(Data(std::string_view(message)), fields);
    return refusal ? testing::inWords(*refusal) : "accepted";
  };
  ThreeFields fields;
  EXPECT_EQ(decodeInto(fields,
                       "<dict><key>ua</key><string>x</string><key>c</key>"
                       "<integer>7</integer></dict>"),
            "accepted");
  EXPECT_EQ(fields.command, 7);
  EXPECT_FALSE(fields.version.has_value());
  EXPECT_EQ(fields.userAgent, String("x"));
  ThreeFields none;
  EXPECT_EQ(decodeInto(none, "<dict/>"), "keyNotFound c: required key is missing");
  EXPECT_EQ(decodeInto(none, "<array/>"), "typeMismatch: expected dictionary, found array");
}

TEST(CodingKeysTest, AreTheTable) {
  const Keys command = Keys::of<&Payload::command>();
  EXPECT_EQ(command.stringValue(), "c");
  EXPECT_EQ(command.name(), "command");
  EXPECT_EQ(command.intValue(), std::nullopt);
  EXPECT_EQ(command.description(), "CodingKeys(stringValue: \"c\", intValue: nil)");
  EXPECT_EQ(command.debugDescription(), command.description());
  EXPECT_FALSE(Keys::fromIntValue(0));
  EXPECT_FALSE(Keys::fromStringValue("C") || Keys::fromRawValue("command"));
  std::unordered_set<Keys> all;
  for (std::size_t i = 0; i < Keys::count; ++i) {
    EXPECT_EQ(Keys::fromRawValue(Keys::at(i).rawValue()), Keys::at(i));
    all.insert(Keys::at(i));
  }
  EXPECT_EQ(all.size(), Keys::count);
}

}  // namespace
}  // namespace ironmoat
