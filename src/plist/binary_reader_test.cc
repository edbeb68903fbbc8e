#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <string_view>

#include "plist/document.h"
#include "plist/reader.h"
#include "support/binary_draft.h"
#include "support/refusal.h"

namespace ironmoat::plist {
namespace {

using namespace std::string_literals;
using ironmoat::testing::bigEndianBytes;
using ironmoat::testing::BinaryDraft;
using ironmoat::testing::refusalOf;

std::string verdict(const Data& message) {
  return refusalOf([&] {
    Document document;
    read(message, document);
  });
}

/// The root of a one-object document, in words.
std::string describe(const std::string& object) {
  Document document;
  read(BinaryDraft().add(object).data(), document);
  const Node& node = document.node(document.root());
  switch (node.kind) {
    case Kind::integer:
      return std::to_string(static_cast<std::int64_t>(node.payload));
    case Kind::unsignedInteger:
      return std::to_string(node.payload) + "u";
    case Kind::boolean:
      return node.payload != 0 ? "true" : "false";
    case Kind::string:
      return "'" + std::string(document.text(node)) + "'";
    default:
      return std::string(nameOf(node.kind)) + " " + std::string(document.text(node));
  }
}

TEST(BinaryReaderTest, EveryKindOfScalar) {
  const struct {
    std::string object;
    std::string value;
  } rows[] = {
      {"\x08"s, "false"},
      {"\x09"s, "true"},
      {"\x10\xFF"s, "255"},
      {"\x11\xFF\xFF"s, "65535"},
      {"\x12\xFF\xFF\xFF\xFF"s, "4294967295"},
      {"\x13" + bigEndianBytes(UINT64_MAX, 8), "-1"},
      {"\x13" + bigEndianBytes(1ULL << 63, 8), "-9223372036854775808"},
      {"\x14" + bigEndianBytes(0, 8) + bigEndianBytes(UINT64_MAX, 8), "18446744073709551615u"},
      {"\x14" + bigEndianBytes(0, 8) + bigEndianBytes(5, 8), "5"},
      {"\x14" + bigEndianBytes(UINT64_MAX, 8) + bigEndianBytes(UINT64_MAX - 1, 8), "-2"},
      {"\x22"s + "1234", "real "},
      {"\x23"s + "12345678", "real "},
      {"\x33"s + "12345678", "date "},
      {"\x80"s + "1", "UID "},
      {"\x43"s + "a\0b"s, "data a\0b"s},
      {"\x4F\x10\x02"s + "ab", "data ab"},
      {"\x4F\x13"s + bigEndianBytes(2, 8) + "ab", "data ab"},
      {"\x50"s, "''"},
      {"\x51"s + "x", "'x'"},
      {"\x62\x00\xE9\x20\xAC"s, "'\xC3\xA9\xE2\x82\xAC'"},
      {"\x62\xD8\x3D\xDE\x00"s, "'\xF0\x9F\x98\x80'"},
      {"\x63\x00\x00\xFF\xFE\x00z"s, "'\0\xEF\xBF\xBEz'"s},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(describe(row.object), row.value) << ::testing::PrintToString(row.object);
  }
}

TEST(BinaryReaderTest, ObjectsThatLieAreRefusedWhereTheyStand) {
  const struct {
    std::string object;
    std::string reason;
  } rows[] = {
      {"\x00"s, "unknown kind of object at offset 8"},  // null
      {"\x0F"s, "unknown kind of object at offset 8"},  // fill
      {"\x15"s + std::string(32, 'x'), "unknown kind of object at offset 8"},
      {"\x21"s + "12", "unknown kind of object at offset 8"},
      {"\x32"s + "1234", "unknown kind of object at offset 8"},
      {"\x70"s, "unknown kind of object at offset 8"},
      {"\xC0"s, "unknown kind of object at offset 8"},  // set
      {"\xE0"s, "unknown kind of object at offset 8"},
      {"\x13"s + "1234567", "object runs out of bounds at offset 8"},
      {"\x87"s + "1234567", "object runs out of bounds at offset 8"},
      {"\x14" + bigEndianBytes(1, 8) + bigEndianBytes(0, 8),
       "integer wider than 64 bits at offset 8"},
      {"\x14" + bigEndianBytes(UINT64_MAX, 8) + bigEndianBytes(0, 8),
       "integer wider than 64 bits at offset 8"},
      {"\x43"s + "ab", "object runs out of bounds at offset 8"},
      {"\x4F"s, "object runs out of bounds at offset 8"},
      {"\x4F\x23"s + "12345678", "length is not an integer at offset 9"},
      {"\x4F\x14"s + std::string(16, '\0'), "length is not an integer at offset 9"},
      {"\x4F\x13" + bigEndianBytes(UINT64_MAX, 8), "object runs out of bounds at offset 8"},
      {"\x5F\x12" + bigEndianBytes(0xFFFFFFFF, 4), "object runs out of bounds at offset 8"},
      {"\x6F\x13" + bigEndianBytes(1ULL << 63, 8), "object runs out of bounds at offset 8"},
      {"\xAF\x13" + bigEndianBytes(UINT64_MAX, 8), "object runs out of bounds at offset 8"},
      {"\xDF\x13" + bigEndianBytes(1ULL << 63, 8), "object runs out of bounds at offset 8"},
      {"\xD1\x00"s, "object runs out of bounds at offset 8"},
      {"\xA1\x01"s, "reference is not in the table at offset 9"},
      {"\x53\x61\x80\x62"s, "ASCII text is not ASCII at offset 10"},
      {"\x61\xD8\x3D"s, "unpaired surrogate at offset 9"},
      {"\x62\xD8\x3D\x00\x41"s, "unpaired surrogate at offset 9"},
      {"\x62\x00\x41\xDE\x00"s, "unpaired surrogate at offset 11"},
      {"\xA1\x00"s, "container inside itself at offset 8"},
      {"\xD1\x00\x00"s, "dictionary key is not text at offset 8"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(verdict(BinaryDraft().add(row.object).data()), "malformed: " + row.reason)
        << ::testing::PrintToString(row.object);
  }
}

TEST(BinaryReaderTest, EveryMarkerIsAcceptedOrRefusedWithoutBytesBehindIt) {
  std::string accepted;
  for (int marker = 0; marker < 256; ++marker) {
    if (verdict(BinaryDraft().add({static_cast<char>(marker)}).data()) == "accepted") {
      accepted += static_cast<char>(marker);
    }
  }
  EXPECT_EQ(accepted, "\x08\x09\x40\x50\x60\xA0\xD0");
}

TEST(BinaryReaderTest, TrailersThatLieAreRefused) {
  const struct {
    std::function<void(BinaryDraft&)> lie;
    std::string verdict;
  } rows[] = {
      {[](BinaryDraft&) {}, "accepted"},
      {[](BinaryDraft& d) {
         d.offsetSize = 8;
         d.referenceSize = 8;
       },
       "accepted"},
      {[](BinaryDraft& d) { d.offsetSize = 0; },
       "malformed: impossible size of offsets at offset 16"},
      {[](BinaryDraft& d) { d.offsetSize = 9; },
       "malformed: impossible size of offsets at offset 25"},
      {[](BinaryDraft& d) { d.referenceSize = 0; },
       "malformed: impossible size of references at offset 19"},
      {[](BinaryDraft& d) { d.root = 1; },
       "malformed: top object is not in the table at offset 28"},
      {[](BinaryDraft& d) { d.objectCount = 0; },
       "malformed: offset table does not fit the object count at offset 20"},
      {[](BinaryDraft& d) { d.objectCount = 2; },
       "malformed: offset table does not fit the object count at offset 20"},
      {[](BinaryDraft& d) { d.objectCount = (1ULL << 63) + 1; },
       "malformed: offset table does not fit the object count at offset 20"},
      {[](BinaryDraft& d) { d.tableOffset = 8; },
       "malformed: offset table out of bounds at offset 36"},
      {[](BinaryDraft& d) { d.tableOffset = UINT64_MAX; },
       "malformed: offset table out of bounds at offset 36"},
      {[](BinaryDraft& d) { d.offsets = {7}; },
       "malformed: object offset out of bounds at offset 10"},
      {[](BinaryDraft& d) { d.offsets = {10}; },
       "malformed: object offset out of bounds at offset 10"},
      {[](BinaryDraft& d) {
         d.offsets = {8, 8};
       },
       "malformed: objects overlap at offset 8"},
  };
  for (const auto& row : rows) {
    BinaryDraft draft;
    draft.integer(1);
    row.lie(draft);
    EXPECT_EQ(verdict(draft.data()), row.verdict);
  }
  EXPECT_EQ(verdict(Data(std::string_view("bplist00"))),
            "malformed: binary property list cut short at offset 8");
  std::string other = BinaryDraft().integer(1).text();
  other[7] = '1';
  EXPECT_EQ(verdict(Data(std::string_view(other))),
            "malformed: unknown version of the binary form at offset 6");
}

TEST(BinaryReaderTest, GraphsAreMeasuredHoweverTheyAreShared) {
  // Parents first, parents last and in between take different ways to the same answer.
  EXPECT_EQ(verdict(BinaryDraft().array({1, 1}).array({2, 2}).array({}).data()), "accepted");
  BinaryDraft parentsLast;
  parentsLast.root = 2;
  EXPECT_EQ(verdict(parentsLast.array({}).array({0, 0}).array({1, 1}).data()), "accepted");
  BinaryDraft loop;
  loop.root = 2;
  EXPECT_EQ(verdict(loop.array({1}).array({0}).array({0}).data()),
            "malformed: container inside itself at offset 8");

  // Doubling at each level: 2^400 ways down, each container entered once.
  for (const bool parentsFirst : {true, false}) {
    BinaryDraft doubling;
    doubling.referenceSize = 2;
    constexpr std::size_t kLevels = 400;
    doubling.root = parentsFirst ? 0 : kLevels - 1;
    for (std::size_t i = 0; i < kLevels; ++i) {
      const bool leaf = i == (parentsFirst ? kLevels - 1 : 0);
      const std::uint64_t child = parentsFirst ? i + 1 : i - 1;
      doubling.array(leaf ? std::vector<std::uint64_t>() : std::vector{child, child});
    }
    EXPECT_EQ(verdict(doubling.data()), "accepted");
  }
}

TEST(BinaryReaderTest, NestingIsBoundedOnEveryWayDown) {
  const auto chain = [](std::size_t containers, bool parentsFirst, bool alsoShortWay) {
    BinaryDraft draft;
    draft.referenceSize = 2;
    draft.root = parentsFirst ? 0 : containers - 1;
    for (std::size_t i = 0; i < containers; ++i) {
      const bool leaf = i == (parentsFirst ? containers - 1 : 0);
      std::vector<std::uint64_t> children;
      if (!leaf) children = {parentsFirst ? i + 1 : i - 1};
      // From the top a short way to the bottom first: what is known of the bottom by then must
      // still count on the long way.
      if (alsoShortWay && i == draft.root) {
        children.insert(children.begin(), parentsFirst ? containers - 2 : 1);
      }
      draft.array(children);
    }
    return verdict(draft.data());
  };
  const std::string tooDeep =
      "limitExceeded: more than 512 dictionaries and arrays inside one another";
  for (const bool parentsFirst : {true, false}) {
    for (const bool alsoShortWay : {false, true}) {
      EXPECT_EQ(chain(512, parentsFirst, alsoShortWay), "accepted");
      EXPECT_EQ(chain(513, parentsFirst, alsoShortWay), tooDeep);
      EXPECT_EQ(chain(20000, parentsFirst, alsoShortWay), tooDeep);
    }
  }
}

TEST(BinaryReaderTest, EveryTruncationAndEveryChangedByteIsAnsweredAlikeTwice) {
  const std::string good = BinaryDraft()
                               .dictionary({1, 2}, {3, 4})
                               .ascii("c")
                               .add("\x62\x00\xE9\x00z"s)
                               .integer(7)
                               .array({5, 6, 3})
                               .add("\x43"s + "abc")
                               .add("\x13" + bigEndianBytes(1, 8))
                               .text();
  ASSERT_EQ(verdict(Data(std::string_view(good))), "accepted");
  for (std::size_t length = 0; length < good.size(); ++length) {
    EXPECT_NE(verdict(Data(std::string_view(good).substr(0, length))), "accepted") << length;
  }
  for (std::size_t at = 0; at < good.size(); ++at) {
    for (int value = 0; value < 256; ++value) {
      std::string changed = good;
      changed[at] = static_cast<char>(value);
      const std::string first = verdict(Data(std::string_view(changed)));
      ASSERT_EQ(first, verdict(Data(std::string_view(changed))));
    }
  }
}

TEST(ReaderTest, MessagesPastTheLimitAreRefusedUnread) {
  const Data large(std::string_view(std::string((std::size_t{16} << 20) + 1, 'x')));
  EXPECT_EQ(verdict(large), "limitExceeded: message of 16777217 bytes, more than 16777216");
  EXPECT_TRUE(verdict(Data()).starts_with("malformed: "));
}

}  // namespace
}  // namespace ironmoat::plist
