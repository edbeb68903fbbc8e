#include <gtest/gtest.h>

#include <algorithm>
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
using testing::refusalOf;
using Keys = Example::CodingKeys;

Example decode(const Data& message) {
  return plist::PropertyListDecoder().decode<Example>(message);
}
Example decodeXml(const std::string& body) {
  return decode(Data(std::string_view("<plist version=\"1.0\">" + body + "</plist>")));
}
std::string refusalOfXml(const std::string& body) {
  return refusalOf([&] { decodeXml(body); });
}

/// The fields in table order, absent ones as "-".
std::string describe(const Example& record) {
  std::string out = std::to_string(record.command);
  const auto add = [&](const auto& field, auto&& show) {
    out += field ? " " + show(*field) : std::string(" -");
  };
  const auto number = [](auto value) { return std::to_string(value); };
  const auto quoted = [](const auto& value) { return "'" + std::string(value.view()) + "'"; };
  const auto list = [](const auto& values, auto&& show) {
    std::string all = "[";
    for (const auto& value : values) all += show(value) + ";";
    return all + "]";
  };
  add(record.number, number);
  add(record.wide, number);
  add(record.flag, number);
  add(record.text, quoted);
  add(record.bytes, quoted);
  add(record.texts, [&](const auto& values) { return list(values, quoted); });
  add(record.children, [&](const auto& values) { return list(values, describe); });
  return out;
}

TEST(KeyedRecordTest, AbsentZeroAndEmptyStayApart) {
  EXPECT_EQ(describe(decodeXml("<dict><key>c</key><integer>5</integer></dict>")),
            "5 - - - - - - -");
  EXPECT_EQ(describe(decodeXml("<dict><key>c</key><integer>0</integer><key>n</key>"
                               "<integer>0</integer><key>f</key><false/><key>t</key><string/>"
                               "<key>b</key><data/><key>tl</key><array/><key>l</key><array/>"
                               "</dict>")),
            "0 0 - 0 '' '' [] []");
}

TEST(KeyedRecordTest, EncodingAndDecodingAreInverse) {
  Example leaf;
  leaf.command = -1;
  leaf.text = String("\xC3\xA9 <&> \r\n \"");
  Example record;
  record.command = INT64_MIN;
  record.number = INT64_MAX;
  record.wide = -2;
  record.flag = true;
  record.bytes = Data(std::string_view("\0\xFF\x80", 3));
  record.texts = List<String>{String("a"), String(""), String("a"), String("\xF0\x9F\x98\x80")};
  record.children = List<Example>{leaf, Example(), leaf};
  for (const plist::Form form : {plist::Form::binary, plist::Form::xml}) {
    const Data message = plist::PropertyListEncoder(form).encode(record);
    EXPECT_EQ(describe(decode(message)), describe(record));
    EXPECT_EQ(describe(decode(plist::PropertyListEncoder(form).encode(leaf))), describe(leaf));
  }

  Example unwritable;
  unwritable.text = String(std::string_view("\0", 1));
  EXPECT_THROW((void)plist::PropertyListEncoder(plist::Form::xml).encode(unwritable),
               std::invalid_argument);
}

/// Text of one XML value of each kind, and the kind's name.
const struct {
  const char* xml;
  const char* kind;
} kValues[] = {
    {"<dict/>", "dictionary"},
    {"<array/>", "array"},
    {"<string>1</string>", "string"},
    {"<data>MTE=</data>", "data"},
    {"<integer>1</integer>", "integer"},
    {"<integer>9223372036854775808</integer>", "too wide"},
    {"<true/>", "boolean"},
    {"<real>1.0</real>", "real"},
    {"<date>2020-01-01T00:00:00Z</date>", "date"},
};

TEST(KeyedRecordTest, EveryFieldTypeTakesOneKindOfValue) {
  const struct {
    const char* key;
    std::string kind;
  } fields[] = {{"n", "integer"}, {"w", "integer"}, {"f", "boolean"}, {"t", "string"},
                {"b", "data"},    {"tl", "array"},  {"l", "array"}};
  for (const auto& field : fields) {
    for (const auto& value : kValues) {
      std::string expected = "accepted";
      if (field.kind == "integer" && value.kind == std::string("too wide")) {
        expected = std::string("outOfRange ") + field.key +
                   ": integer does not fit in 64 bits with a sign";
      } else if (value.kind != field.kind) {
        const std::string found = value.kind == std::string("too wide") ? "integer" : value.kind;
        expected = std::string("typeMismatch ") + field.key + ": expected " + field.kind +
                   ", found " + found;
      }
      EXPECT_EQ(refusalOfXml(std::string("<dict><key>") + field.key + "</key>" + value.xml +
                             "<key>c</key><integer>1</integer></dict>"),
                expected);
    }
  }
  for (const auto& value : kValues) {
    if (value.kind == std::string("dictionary")) continue;
    const std::string found = value.kind == std::string("too wide") ? "integer" : value.kind;
    EXPECT_EQ(refusalOfXml(value.xml), "typeMismatch: expected dictionary, found " + found);
  }
}

TEST(KeyedRecordTest, TheFirstErrorInTableOrderWins) {
  // "n" stands before "t" in the table; in the message both orders occur, in both forms.
  const std::string n = "<key>n</key><string/>";
  const std::string t = "<key>t</key><integer>1</integer>";
  const std::string c = "<key>c</key><integer>1</integer>";
  for (const std::string& entries : {c + n + t, t + n + c, n + t + c}) {
    EXPECT_EQ(refusalOfXml("<dict>" + entries + "</dict>"),
              "typeMismatch n: expected integer, found string");
  }
  for (const bool inTableOrder : {true, false}) {
    BinaryDraft draft;
    const std::vector<std::uint64_t> keys =
        inTableOrder ? std::vector<std::uint64_t>{1, 2, 3} : std::vector<std::uint64_t>{3, 2, 1};
    const std::vector<std::uint64_t> values =
        inTableOrder ? std::vector<std::uint64_t>{4, 3, 4} : std::vector<std::uint64_t>{4, 3, 4};
    draft.dictionary(keys, values).ascii("c").ascii("n").ascii("t").integer(1);
    EXPECT_EQ(refusalOf([&] { decode(draft.data()); }),
              "typeMismatch n: expected integer, found string");
  }
  EXPECT_EQ(refusalOfXml("<dict>" + n + "</dict>"), "keyNotFound c: required key is missing");
}

TEST(KeyedRecordTest, PathsNameTheWayInWireKeys) {
  const auto child = [](const std::string& entries) {
    return "<dict><key>c</key><integer>1</integer>" + entries + "</dict>";
  };
  const auto list = [&](const std::string& elements) {
    return child("<key>l</key><array>" + elements + "</array>");
  };
  EXPECT_EQ(refusalOfXml(list(child("") + list(child("<key>b</key><true/>")))),
            "typeMismatch l[1].l[0].b: expected data, found boolean");
  EXPECT_EQ(refusalOfXml(list(child("") + "<dict/>")),
            "keyNotFound l[1].c: required key is missing");
  EXPECT_EQ(refusalOfXml(list("<string/>")),
            "typeMismatch l[0]: expected dictionary, found string");
  EXPECT_EQ(refusalOfXml(child("<key>tl</key><array><string/><integer>1</integer></array>")),
            "typeMismatch tl[1]: expected string, found integer");
  // Depth first: a later element's error loses against one deep inside an earlier one.
  EXPECT_EQ(refusalOfXml(list(list("<dict/>") + "<true/>")),
            "keyNotFound l[0].l[0].c: required key is missing");
}

TEST(KeyedRecordTest, OtherKeysAreIgnoredAndTheLastOfEqualKeysCounts) {
  EXPECT_EQ(describe(decodeXml("<dict><key>C</key><string/><key>c </key><true/><key/><dict/>"
                               "<key>t</key><true/><key>n</key><integer>1</integer>"
                               "<key>c</key><integer>7</integer><key>n</key><integer>2</integer>"
                               "<key>t</key><string>last</string></dict>")),
            "7 2 - - 'last' - - -");
  BinaryDraft draft;
  draft.dictionary({1, 1, 1}, {2, 1, 3}).ascii("c").integer(1).integer(3);
  EXPECT_EQ(decode(draft.data()).command, 3);
  draft = BinaryDraft();
  draft.dictionary({1, 1}, {2, 1}).ascii("c").integer(1);
  EXPECT_EQ(refusalOf([&] { decode(draft.data()); }),
            "typeMismatch c: expected integer, found string");
}

TEST(KeyedRecordTest, SharedValuesArePaidForEachTime) {
  // A list of many references to one small record: memory for records.
  BinaryDraft tiny;
  tiny.offsetSize = 4;
  tiny.dictionary({1, 2}, {3, 4}).ascii("c").ascii("l").integer(1);
  const std::size_t most = limits::recordBytes / sizeof(Example);
  const auto references = [](std::size_t count, std::uint64_t object) {
    return std::vector<std::uint64_t>(count, object);
  };
  BinaryDraft fits = tiny;
  fits.array(references(most, 5)).dictionary({1}, {3});
  EXPECT_EQ(decode(fits.data()).children->size(), most);
  BinaryDraft over = tiny;
  over.array(references(most + 1, 5)).dictionary({1}, {3});
  EXPECT_EQ(refusalOf([&] { decode(over.data()); }),
            "limitExceeded l: lists take more memory than the limit of 67108864 bytes");

  // One megabyte of data, used 65 times: bytes delivered.
  BinaryDraft shared = tiny;
  shared.array(references(65, 5))
      .dictionary({1, 6}, {3, 7})
      .ascii("b")
      .add(BinaryDraft::head(0x40, std::size_t{1} << 20) + std::string(std::size_t{1} << 20, 'x'));
  EXPECT_EQ(refusalOf([&] { decode(shared.data()); }),
            "limitExceeded l[64].b: text and data come to more than the limit of 67108864 bytes");

  // One dictionary of 100,000 unknown entries, scanned again and again: entries looked at.
  BinaryDraft wide = tiny;
  std::vector<std::uint64_t> keys = references(100000, 6);
  keys.push_back(1);
  std::vector<std::uint64_t> values = references(100000, 3);
  values.push_back(3);
  wide.array(references(200, 5)).dictionary(keys, values).ascii("unknown");
  EXPECT_EQ(refusalOf([&] { decode(wide.data()); }),
            "limitExceeded l[167]: shared dictionaries come to more than the limit of 16777216 "
            "entries");
}

TEST(CodingKeysTest, AreTheTable) {
  const Keys command = Keys::of<&Example::command>();
  EXPECT_EQ(command.stringValue(), "c");
  EXPECT_EQ(command.rawValue(), "c");
  EXPECT_EQ(command.name(), "command");
  EXPECT_EQ(command.intValue(), std::nullopt);
  EXPECT_EQ(command.description(), "CodingKeys(stringValue: \"c\", intValue: nil)");
  EXPECT_EQ(command.debugDescription(), command.description());
  for (const Int value : {Int{0}, Int{1}, Int{-1}, Int{INT64_MAX}}) {
    EXPECT_FALSE(Keys::fromIntValue(value));
  }
  for (const char* text : {"", "C", "c ", " c", "cc", "command", "l[0]"}) {
    EXPECT_FALSE(Keys::fromStringValue(text)) << text;
    EXPECT_FALSE(Keys::fromRawValue(text)) << text;
  }
  std::unordered_set<Keys> all;
  for (std::size_t i = 0; i < Keys::count; ++i) {
    EXPECT_EQ(Keys::fromStringValue(Keys::at(i).stringValue()), Keys::at(i));
    EXPECT_EQ(Keys::fromRawValue(Keys::at(i).rawValue()), Keys::at(i));
    all.insert(Keys::at(i));
  }
  EXPECT_EQ(all.size(), Keys::count);
  EXPECT_EQ(std::hash<Keys>()(command), std::hash<std::string_view>()("c"));
}

}  // namespace
}  // namespace ironmoat
