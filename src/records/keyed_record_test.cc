#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <unordered_set>
#include <vector>

#include "plist/property_list_decoder.h"
#include "records/keyed_record_impl.h"
#include "support/binary_draft.h"
#include "support/refusal.h"

namespace ironmoat {

/// One field of every type that a record may have.
struct Example {
  using CodingKeys = records::CodingKeys<Example>;

  Int command = 0;
  Optional<Int> number;
  Optional<Int64> wide;
  Optional<Bool> flag;
  Optional<String> text;
  Optional<Data> bytes;
  Optional<List<String>> texts;
  Optional<List<Example>> children;

  static Example decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};
void decodeInto(const plist::Decoder& decoder, Example& record);

template <>
struct records::Table<Example> {
  using R = Example;
  static constexpr KeyTable rows{
      row<&R::command>("c"), row<&R::number>("n"), row<&R::wide>("w"),   row<&R::flag>("f"),
      row<&R::text>("t"),    row<&R::bytes>("b"),  row<&R::texts>("tl"), row<&R::children>("l"),
  };
};
IRONMOAT_KEYED_RECORD(Example);

namespace {

using testing::BinaryDraft;
using Keys = Example::CodingKeys;

Example decode(const Data& message) {
  return plist::PropertyListDecoder().decode<Example>(message);
}

/// A value in words; of a record the fields in table order, absent ones as "-".
template <class T>
std::string describe(const T& value) {
  if constexpr (std::is_arithmetic_v<T>) {
    return std::to_string(value);
  } else if constexpr (requires { value.view(); }) {
    return "'" + std::string(value.view()) + "'";
  } else if constexpr (requires { value.has_value(); }) {
    return value ? describe(*value) : "-";
  } else if constexpr (std::is_same_v<T, Example>) {
    std::string all;
    records::detail::overMembers(
        records::Table<Example>::rows, [&]<auto... Members>() {
          ((all += describe(value.*Members) + " "), ...);
        });
    return all;
  } else {
    std::string all = "[";
    for (const auto& element : value) all += describe(element) + ";";
    return all + "]";
  }
}

/// The record that a message holds, or what it is refused with.
std::string outcome(const Data& message) {
  std::string record;
  const auto verdict = testing::refusalOf([&] { record = describe(decode(message)); });
  return verdict == "accepted" ? record : verdict;
}
std::string outcome(const std::string& xml) {
  return outcome(Data(std::string_view("<plist version=\"1.0\">" + xml + "</plist>")));
}

// S11.
TEST(KeyedRecordTest, RecordsAndRefusals) {
  const std::string c = "<key>c</key><integer>1</integer>";
  const std::string n = "<key>n</key><string/>";
  const std::string t = "<key>t</key><integer>1</integer>";
  const auto list = [&](const std::string& elements) {
    return "<dict>" + c + "<key>l</key><array>" + elements + "</array></dict>";
  };
  const std::string leaf = "<dict>" + c + "</dict>";
  const std::string firstOfTwo = "typeMismatch n: expected integer, found string";
  const struct {
    std::string xml;
    std::string outcome;
  } rows[] = {
      // Absent, zero and empty stay apart.
      {leaf, "1 - - - - - - - "},
      {"<dict><key>c</key><integer>0</integer><key>n</key><integer>0</integer><key>f</key><false/>"
       "<key>t</key><string/><key>b</key><data/><key>tl</key><array/><key>l</key><array/></dict>",
       "0 0 - 0 '' '' [] [] "},
      // Other keys are ignored, of equal ones the last counts.
      {"<dict><key>C</key><string/><key>c </key><true/><key/><dict/>" + t + n + c +
           "<key>n</key><integer>2</integer><key>t</key><string>last</string></dict>",
       "1 2 - - 'last' - - - "},
      // The first error in the table's order wins, and depth first.
      {"<dict>" + c + n + t + "</dict>", firstOfTwo},
      {"<dict>" + t + n + c + "</dict>", firstOfTwo},
      {"<dict>" + n + "</dict>", "keyNotFound c: required key is missing"},
      {list(list("<dict/>") + "<true/>"), "keyNotFound l[0].l[0].c: required key is missing"},
      // Paths name the way in wire keys.
      {list(leaf + list("<dict>" + c + "<key>b</key><true/></dict>")),
       "typeMismatch l[1].l[0].b: expected data, found boolean"},
      {list("<string/>"), "typeMismatch l[0]: expected dictionary, found string"},
      {"<dict>" + c + "<key>tl</key><array><string/><integer>1</integer></array></dict>",
       "typeMismatch tl[1]: expected string, found integer"},
  };
  for (const auto& row : rows) EXPECT_EQ(outcome(row.xml), row.outcome) << row.xml;
  // Only binary messages have one value under several keys, or a key as a value.
  const auto binary = [](const std::vector<std::uint64_t>& keys,
                         const std::vector<std::uint64_t>& values) {
    return outcome(
        BinaryDraft().dictionary(keys, values).ascii("c").ascii("n").ascii("t").integer(1).data());
  };
  EXPECT_EQ(binary({1, 2, 3}, {4, 3, 4}), firstOfTwo);
  EXPECT_EQ(binary({3, 2, 1}, {4, 3, 4}), firstOfTwo);
  EXPECT_EQ(binary({1, 1, 3}, {2, 4, 1}), "1 - - - 'c' - - - ");
  EXPECT_EQ(binary({1, 1}, {4, 1}), "typeMismatch c: expected integer, found string");
}

TEST(KeyedRecordTest, EveryFieldTypeTakesOneKindOfValue) {
  const struct {
    const char* xml;
    std::string kind;
  } values[] = {
      {"<dict/>", "dictionary"},           {"<array/>", "array"},
      {"<string>1</string>", "string"},    {"<data>MTE=</data>", "data"},
      {"<integer>1</integer>", "integer"}, {"<true/>", "boolean"},
      {"<real>1.0</real>", "real"},        {"<date>2020-01-01T00:00:00Z</date>", "date"},
  };
  const std::string tooWide = "<integer>9223372036854775808</integer>";
  const struct {
    std::string key;
    std::string kind;
  } fields[] = {{"c", "integer"}, {"n", "integer"}, {"w", "integer"}, {"f", "boolean"},
                {"t", "string"},  {"b", "data"},    {"tl", "array"},  {"l", "array"}};
  for (const auto& [key, kind] : fields) {
    const auto with = [start = "<dict><key>c</key><integer>1</integer><key>" + key + "</key>"](
                          const std::string& value) { return outcome(start + value + "</dict>"); };
    for (const auto& value : values) {
      const std::string mismatch =
          "typeMismatch " + key + ": expected " + kind + ", found " + value.kind;
      EXPECT_EQ(with(value.xml) == mismatch, value.kind != kind) << with(value.xml);
    }
    EXPECT_EQ(with(tooWide),
              kind == "integer"
                  ? "outOfRange " + key + ": integer does not fit in 64 bits with a sign"
                  : "typeMismatch " + key + ": expected " + kind + ", found integer");
  }
  for (const auto& value : values) {
    const std::string expected = value.kind == "dictionary"
                                     ? "keyNotFound c: required key is missing"
                                     : "typeMismatch: expected dictionary, found " + value.kind;
    EXPECT_EQ(outcome(value.xml), expected);
  }
}

TEST(KeyedRecordTest, EncodingAndDecodingAreInverse) {
  const auto encoded = [](const Example& record, plist::Form form) {
    return plist::PropertyListEncoder(form).encode(record);
  };
  Example leaf;
  leaf.command = -1;
  leaf.text = String("\xC3\xA9 <&> \r\n \"");
  Example record;
  record.command = INT64_MIN;
  record.number = INT64_MAX;
  record.wide = -2;
  record.flag = true;
  record.text = String(std::string(70'000, 'x'));  // offsets behind it take more than two bytes
  record.bytes = Data(std::string_view("\0\xFF\x80", 3));
  record.texts = List<String>{String("a"), String(""), String("a"), String("\xF0\x9F\x98\x80")};
  record.children = List<Example>{leaf, Example(), leaf};
  for (const plist::Form form : {plist::Form::binary, plist::Form::xml}) {
    EXPECT_EQ(outcome(encoded(record, form)), describe(record));
  }
  const std::size_t once = encoded(record, plist::Form::binary).size();
  record.texts->push_back(*record.text);
  EXPECT_LT(encoded(record, plist::Form::binary).size(), once + 100);  // equal texts are shared

  leaf.text = String(std::string_view("\0", 1));
  EXPECT_THROW((void)encoded(leaf, plist::Form::xml), std::invalid_argument);
}

TEST(KeyedRecordTest, ContainersDecodeFieldByField) {
  plist::Document document;
  plist::read(BinaryDraft().dictionary({1, 2}, {3, 2}).ascii("c").ascii("t").integer(7).data(),
              document);
  plist::Budget budget;
  const plist::Decoder decoder(document, budget);
  const auto container = decoder.container<Keys>();
  EXPECT_EQ(container.decode<Int>(Keys::of<&Example::command>()), 7);
  EXPECT_EQ(container.decodeIfPresent<String>(Keys::of<&Example::text>()), String("t"));
  EXPECT_EQ(container.decodeIfPresent<Int>(Keys::of<&Example::number>()), std::nullopt);
}

// S4.
TEST(KeyedRecordTest, SharedValuesArePaidForEachTime) {
  const auto references = [](std::size_t count, std::uint64_t object) {
    return std::vector<std::uint64_t>(count, object);
  };
  BinaryDraft list;
  list.offsetSize = 4;
  list.dictionary({1, 2}, {3, 4}).ascii("c").ascii("l").integer(1);
  // A list of many references to one small record: memory for records.
  const std::size_t most = limits::recordBytes / sizeof(Example);
  BinaryDraft fits = list;
  fits.array(references(most, 5)).dictionary({1}, {3});
  EXPECT_EQ(decode(fits.data()).children->size(), most);
  BinaryDraft over = list;
  over.array(references(most + 1, 5)).dictionary({1}, {3});
  EXPECT_EQ(outcome(over.data()),
            "limitExceeded l: lists take more memory than the limit of 67108864 bytes");
  // One megabyte of data, used 65 times: bytes delivered.
  BinaryDraft shared = list;
  shared.array(references(65, 5)).dictionary({1, 6}, {3, 7}).ascii("b");
  shared.add(BinaryDraft::head(0x40, std::size_t{1} << 20) +
             std::string(std::size_t{1} << 20, 'x'));
  EXPECT_EQ(outcome(shared.data()),
            "limitExceeded l[64].b: text and data come to more than the limit of 67108864 bytes");
  // One dictionary of 100,000 unknown entries, scanned again and again: entries looked at.
  BinaryDraft wide = list;
  std::vector<std::uint64_t> keys = references(100'001, 6);
  keys.back() = 1;
  wide.array(references(200, 5)).dictionary(keys, references(100'001, 3)).ascii("unknown");
  EXPECT_EQ(outcome(wide.data()),
            "limitExceeded l[83]: shared dictionaries come to more than the limit of 8388608 "
            "entries");
}

TEST(CodingKeysTest, AreTheTable) {
  const Keys command = Keys::of<&Example::command>();
  EXPECT_EQ(command.stringValue(), "c");
  EXPECT_EQ(command.name(), "command");
  EXPECT_EQ(command.intValue(), std::nullopt);
  EXPECT_EQ(command.description(), "CodingKeys(stringValue: \"c\", intValue: nil)");
  EXPECT_EQ(command.debugDescription(), command.description());
  EXPECT_FALSE(Keys::fromIntValue(0));
  for (const char* text : {"", "C", "c ", " c", "cc", "command", "l[0]"}) {
    EXPECT_FALSE(Keys::fromStringValue(text) || Keys::fromRawValue(text)) << text;
  }
  std::unordered_set<Keys> all;
  for (std::size_t i = 0; i < Keys::count; ++i) {
    EXPECT_EQ(Keys::fromStringValue(Keys::at(i).stringValue()), Keys::at(i));
    EXPECT_EQ(Keys::fromRawValue(Keys::at(i).rawValue()), Keys::at(i));
    all.insert(Keys::at(i));
  }
  EXPECT_EQ(all.size(), Keys::count);
}

}  // namespace
}  // namespace ironmoat
