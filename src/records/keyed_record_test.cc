// Beside model_test.py: descriptions, keys and values that only the binary format can share, and
// what shared values cost.

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

template <class Record>
std::string outcome(const Data& message, Record& record) {
  const auto rejection = plist::PropertyListDecoder().decode(message, record);
  return rejection ? testing::inWords(*rejection) : "accepted";
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
TEST(KeyedRecord, RejectsTheFirstInvalidFieldOfTheTable) {
  const std::string c = xml::number("c", 1);
  const std::string v = xml::text("v", "");
  const std::string ua = xml::number("ua", 1);
  const auto list = [&](const std::string& elements) {
    return c + xml::entry("mml", xml::array(elements));
  };
  const auto wide = [](std::string_view key) {
    return xml::entry(key, xml::element("integer", "9223372036854775808"));
  };
  const std::string firstOfTwo = "typeMismatch v: expected integer, found string";
  const struct {
    std::string entries;
    std::string outcome;
  } rows[] = {
      {c + v + ua, firstOfTwo},
      {ua + v + c, firstOfTwo},
      {v, "keyNotFound c: missing required key"},
      {xml::number("C", 1),
       "keyNotFound c: missing required key; found a key that differs only in case"},
      {c + ua + v + xml::number("v", 2) + xml::text("ua", ""), "accepted"},
      {list(xml::dictionary(list("<dict/>")) + "<true/>"),
       "keyNotFound mml[0].mml[0].c: missing required key"},
      {list("<string/>"), "typeMismatch mml[0]: expected dictionary, found string"},
      {c + xml::number("D", 1), "typeMismatch D: expected boolean, found integer"},
      {c + xml::entry("ua", "<data/>"), "typeMismatch ua: expected string, found data"},
      {c + xml::entry("P", "<real>1</real>"), "typeMismatch P: expected data, found real"},
      {c + xml::entry("dal", "<dict/>"), "typeMismatch dal: expected array, found dictionary"},
      {c + xml::entry("h", "<array/>"), "typeMismatch h: expected dictionary, found array"},
      {c + xml::entry("v", "<date>2020-01-01T00:00:00Z</date>"),
       "typeMismatch v: expected integer, found date"},
      {c + wide("v"), "outOfRange v: not a valid signed 64-bit integer"},
      {c + wide("D"), "typeMismatch D: expected boolean, found integer"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(outcome(xml::message(xml::dictionary(row.entries))), row.outcome);
  }
  // Only binary messages have one value under several keys, or a key as a value.
  const auto binary = [](const std::vector<std::uint64_t>& keys,
                         const std::vector<std::uint64_t>& values) {
    return BinaryBuilder().dictionary(keys, values).ascii("c").ascii("v").ascii("ua").integer(1);
  };
  EXPECT_EQ(outcome(binary({1, 2, 3}, {4, 3, 4}).data()), firstOfTwo);
  EXPECT_EQ(outcome(binary({3, 2, 1}, {4, 3, 4}).data()), firstOfTwo);
  EXPECT_EQ(decode(binary({1, 1, 3}, {2, 4, 1}).data()).userAgent, String("c"));
  EXPECT_EQ(outcome(binary({1, 1}, {4, 1}).data()),
            "typeMismatch c: expected integer, found string");
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
  const auto references = [](std::size_t count, std::uint64_t object) {
    return std::vector<std::uint64_t>(count, object);
  };
  BinaryBuilder list;
  list.offsetSize = 4;
  list.dictionary({1, 2}, {3, 4}).ascii("c").ascii("mml").integer(1);
  const std::size_t max = limits::recordBytes / sizeof(Payload);
  BinaryBuilder fits = list;
  fits.array(references(max, 5)).dictionary({1}, {3});
  EXPECT_EQ(decode(fits.data()).corvelMessageList->size(), max);
  BinaryBuilder over = list;
  over.array(references(max + 1, 5)).dictionary({1}, {3});
  EXPECT_EQ(outcome(over.data()),
            "limitExceeded mml: memory of lists exceeds the limit of 67108864 bytes");
  // One megabyte of data, used 65 times.
  constexpr std::size_t kMegabyte = std::size_t{1} << 20;
  BinaryBuilder shared = list;
  shared.array(references(65, 5)).dictionary({1, 6}, {3, 7}).ascii("P");
  shared.add(BinaryBuilder::head(0x40, kMegabyte) + std::string(kMegabyte, 'x'));
  EXPECT_EQ(outcome(shared.data()),
            "limitExceeded mml[64].P: size of text and data exceeds the limit of 67108864 bytes");
  // One dictionary of 100,000 unknown entries, scanned 84 times.
  BinaryBuilder wide = list;
  std::vector<std::uint64_t> keys = references(100'001, 6);
  keys.back() = 1;
  wide.array(references(200, 5)).dictionary(keys, references(100'001, 3)).ascii("unknown");
  EXPECT_EQ(outcome(wide.data()),
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
  EXPECT_EQ(command.description(), "CodingKeys(stringValue: \"c\", intValue: nil)");
  EXPECT_EQ(command.debugDescription(), command.description());
  EXPECT_EQ(command.intValue(), std::nullopt);
  EXPECT_FALSE(Keys::fromIntValue(0) || Keys::fromStringValue("C"));
  EXPECT_EQ(Keys::fromRawValue("c"), command);
}

}  // namespace
}  // namespace ironmoat
