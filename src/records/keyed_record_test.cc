// Beside the model of fuzz/model.py: descriptions, keys and values that only the binary format can
// share, and what shared values cost.

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "plist/encoder.h"
#include "plist/property_list_decoder.h"
#include "records/message_payload.h"
#include "support/binary_builder.h"
#include "support/rejection.h"
#include "support/xml_message.h"

namespace ironmoat {
namespace {

using testing::BinaryBuilder;
using Payload = VeskCorvelProtocolPayload;
using Keys = Payload::CodingKeys;
namespace xml = testing::xml;

template <class Record = Payload>
std::string outcome(const Data& message, Record&& record = {}) {
  const auto rejection = plist::PropertyListDecoder().decode(message, record);
  return rejection ? testing::inWords(*rejection) : "accepted";
}
Payload decode(const Data& message) {
  Payload record;
  EXPECT_EQ(outcome(message, record), "accepted");
  return record;
}

// S11.
TEST(KeyedRecord, RejectsTheFirstInvalidFieldOfTheTable) {
  const std::string c = xml::number("c", 1);
  const std::string v = xml::text("v", "");
  const std::string ua = xml::number("ua", 1);
  const auto list = [&](const std::string& elements) {
    return c + xml::entry("mml", xml::element("array", elements));
  };
  const std::string wide = xml::element("integer", "9223372036854775808");
  const std::string firstOfTwo = "typeMismatch v: expected integer, found string";
  const std::pair<std::string, std::string> rows[] = {
      {c + v + ua, firstOfTwo},
      {ua + v + c, firstOfTwo},
      {xml::number("C", 1),
       "keyNotFound c: missing required key; found a key that differs only in case"},
      {c + ua + v + xml::number("v", 2) + xml::text("ua", ""), "accepted"},
      {list(xml::dictionary(list("<dict/>")) + "<true/>"),
       "keyNotFound mml[0].mml[0].c: missing required key"},
      {list("<string/>"), "typeMismatch mml[0]: expected dictionary, found string"},
      {c + xml::entry("v", wide), "outOfRange v: not a valid signed 64-bit integer"},
      {c + xml::entry("D", wide), "typeMismatch D: expected boolean, found integer"},
  };
  for (const auto& [entries, expected] : rows) {
    EXPECT_EQ(outcome(xml::message(xml::dictionary(entries))), expected);
  }
  // Only binary messages have one value under several keys, or a key as a value.
  const auto binary = [](const std::vector<std::uint64_t>& keys,
                         const std::vector<std::uint64_t>& values) {
    BinaryBuilder builder;
    builder.dictionary(keys, values).ascii("c").ascii("v").ascii("ua").integer(1);
    return builder.data();
  };
  EXPECT_EQ(outcome(binary({1, 2, 3}, {4, 3, 4})), firstOfTwo);
  EXPECT_EQ(outcome(binary({3, 2, 1}, {4, 3, 4})), firstOfTwo);
  EXPECT_EQ(decode(binary({1, 1, 3}, {2, 4, 1})).userAgent, String("c"));
  EXPECT_EQ(outcome(binary({1, 1}, {4, 1})), "typeMismatch c: expected integer, found string");
}

TEST(KeyedRecord, EqualTextsAreWrittenOnce) {
  Payload record;
  record.userAgent = String(std::string(1000, 'x'));
  const plist::PropertyListEncoder encoder(plist::Format::binary);
  const std::size_t once = encoder.encode(record).size();
  record.httpUrl = record.userAgent;
  EXPECT_LT(encoder.encode(record).size(), once + 100);
}

// S4.
TEST(KeyedRecord, LimitsCountSharedValuesEachTime) {
  using References = std::vector<std::uint64_t>;
  const auto payloads = [](std::size_t count) {  // object 5, which comes next
    BinaryBuilder builder;
    builder.offsetSize = 4;
    builder.dictionary({1, 2}, {3, 4}).ascii("c").ascii("mml").integer(1);
    return builder.array(References(count, 5));
  };
  const std::size_t max = limits::recordBytes / sizeof(Payload);
  EXPECT_EQ(decode(payloads(max).dictionary({1}, {3}).data()).corvelMessageList->size(), max);
  EXPECT_EQ(outcome(payloads(max + 1).dictionary({1}, {3}).data()),
            "limitExceeded mml: memory of lists exceeds the limit of 67108864 bytes");
  const std::string megabyte(std::size_t{1} << 20, 'x');
  EXPECT_EQ(outcome(payloads(65)
                        .dictionary({1, 6}, {3, 7})
                        .ascii("P")
                        .add(BinaryBuilder::head(0x40, megabyte.size()) + megabyte)
                        .data()),
            "limitExceeded mml[64].P: size of text and data exceeds the limit of 67108864 bytes");
  References keys(100'001, 6);
  keys.back() = 1;
  EXPECT_EQ(outcome(payloads(200).dictionary(keys, References(100'001, 3)).ascii("?").data()),
            "limitExceeded mml[83]: size of shared dictionaries exceeds the limit of 8388608 "
            "entries");
}

/// A record that decodes its fields without a table.
struct TwoFields {
  Int command = 0;
  Optional<Int> version;

  [[nodiscard]] bool decode(const plist::Decoder& decoder) {
    const auto container = decoder.container<Keys>();
    return container && container.decode(command, Keys::of<&Payload::command>()) &&
           container.decodeIfPresent(version, Keys::of<&Payload::version>());
  }
};

TEST(KeyedDecodingContainer, RequiresARequiredEntryAndSkipsAnAbsentOne) {
  const struct {
    std::string value;
    std::string outcome;
    Optional<Int> version;
  } rows[] = {
      {xml::dictionary(xml::number("c", 7)), "accepted", {}},
      {xml::dictionary(xml::number("v", 8) + xml::number("c", 7)), "accepted", 8},
      {"<dict/>", "keyNotFound c: missing required key", {}},
      {"<array/>", "typeMismatch: expected dictionary, found array", {}},
  };
  for (const auto& row : rows) {
    TwoFields fields;
    EXPECT_EQ(outcome(xml::message(row.value), fields), row.outcome);
    EXPECT_EQ(fields.version, row.version);
  }
}

TEST(CodingKeys, AreDescribedByTheirWireKey) {
  const Keys command = Keys::of<&Payload::command>();
  EXPECT_EQ(command.debugDescription(), "CodingKeys(stringValue: \"c\", intValue: nil)");
  EXPECT_FALSE(command.intValue() || Keys::fromIntValue(0) || Keys::fromStringValue("C"));
  EXPECT_EQ(Keys::fromRawValue("c"), command);
}

}  // namespace
}  // namespace ironmoat
