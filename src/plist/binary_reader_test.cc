#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <string_view>

#include "plist/reader.h"
#include "support/binary_draft.h"
#include "support/refusal.h"
#include "support/show_document.h"

namespace ironmoat::plist {
namespace {

using namespace std::string_literals;
using ironmoat::testing::bigEndianBytes;
using ironmoat::testing::BinaryDraft;
using ironmoat::testing::tightMessage;

/// The tree that a message holds, or what it is refused with.
std::string outcome(const Data& message, bool shown = true) {
  Document document;
  if (const auto refusal = read(message, document)) return ironmoat::testing::inWords(*refusal);
  return shown ? show(document) : "accepted";
}

const std::string kMost = bigEndianBytes(UINT64_MAX, 8);
const std::string kTopBit = bigEndianBytes(1ULL << 63, 8);
const std::string kOne = bigEndianBytes(1, 8);
const std::string kZero = bigEndianBytes(0, 8);

TEST(BinaryReaderTest, EveryKindOfObject) {
  const struct {
    std::string object;
    std::string tree;
  } rows[] = {
      {"\x00"s, "null"},
      {"\x08"s, "false"},
      {"\x09"s, "true"},
      {"\x12\xFF\xFF\xFF\xFE"s, "4294967294"},
      {"\x13" + kTopBit, "-9223372036854775808"},
      {"\x14" + kZero + kTopBit, "wide integer"},
      {"\x14" + kMost + kZero, "wide integer"},
      {"\x14" + kOne + kZero, "wide integer"},
      {"\x14" + kMost + bigEndianBytes(UINT64_MAX - 1, 8), "-2"},
      {"\x80"s + "1", "UID"},
      {"\x4F\x13"s + bigEndianBytes(2, 8) + "ab", "data \"ab\""},
      {"\x5F\x10\x01"s + "x", "\"x\""},
      {"\x62\xD8\x3D\xDE\x00"s, "\"\xF0\x9F\x98\x80\""},
      {"\x63\x00\x00\xFF\xFE\x00z"s, "\"\0\xEF\xBF\xBEz\""s},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(outcome(BinaryDraft().add(row.object).data()), row.tree);
  }
  EXPECT_EQ(outcome(BinaryDraft().add("\xC2\x01\x01"s).integer(7).data()), "set [7, 7]");
  std::string complete;  // markers that need no bytes behind them
  for (int marker = 0; marker < 256; ++marker) {
    const BinaryDraft draft = BinaryDraft().add({static_cast<char>(marker)});
    if (!outcome(draft.data()).starts_with("malformed")) complete += static_cast<char>(marker);
  }
  EXPECT_EQ(complete, "\x00\x08\x09\x40\x50\x60\xA0\xC0\xD0"s);
}

TEST(BinaryReaderTest, ObjectsThatLieAreRefusedWhereTheyStand) {
  const std::string unknown = "unknown kind of object at offset 8";
  const std::string tooLong = "object runs out of bounds at offset 8";
  const struct {
    std::string object;
    std::string reason;
  } rows[] = {
      {"\x15"s + std::string(32, 'x'), unknown},
      {"\x21"s + "12", unknown},
      {"\x0F"s, unknown},
      {"\x43"s + "ab", tooLong},
      {"\x4F"s, tooLong},
      {"\x4F\x10"s, tooLong},
      {"\x4F\x23"s + "12345678", "length is not an integer at offset 9"},
      {"\x4F\x14"s + kZero + kZero, "length is not an integer at offset 9"},
      {"\x6F\x23" + std::string(32, 'x'), "length is not an integer at offset 9"},
      {"\x6F\x13" + kTopBit, tooLong},
      {"\xAF\x13" + kMost, tooLong},
      {"\xDF\x13" + kTopBit, tooLong},
      {"\xA1\x01"s, "reference is not in the table at offset 9"},
      {"\x61\xD8\x3D"s, "unpaired surrogate at offset 9"},
      {"\x62\xD8\x3D\x00\x41"s, "unpaired surrogate at offset 9"},
      {"\x62\xDE\x00\xDE\x00"s, "unpaired surrogate at offset 9"},
      {"\x62\x00\x41\xDE\x00"s, "unpaired surrogate at offset 11"},
      {"\xA1\x00"s, "container inside itself at offset 8"},
      {"\xC1\x00"s, "container inside itself at offset 8"},
      {"\xD1\x00\x00"s, "dictionary key is not text at offset 8"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(outcome(BinaryDraft().add(row.object).data()), "malformed: " + row.reason)
        << ::testing::PrintToString(row.object);
  }
  // A pair is not made with the first bytes of what stands behind the text.
  EXPECT_EQ(
      outcome(BinaryDraft().add("\x61\xD8\x3D"s).add("\xDC"s.append(24, '\x02')).ascii("k").data()),
      "malformed: unpaired surrogate at offset 9");
}

TEST(BinaryReaderTest, AsciiIsAsciiAtEveryPlace) {
  for (std::size_t length = 1; length <= 40; ++length) {
    const std::string text(length, 'x');
    // The byte behind the text is none of it.
    EXPECT_EQ(outcome(BinaryDraft().ascii(text).add("\x80z").data()), "\""s + text + "\"");
    for (std::size_t at = 0; at < length; ++at) {
      std::string wrong = text;
      wrong[at] = '\x80';
      const std::size_t place = (length < 15 ? 9 : 11) + at;
      EXPECT_EQ(outcome(BinaryDraft().ascii(wrong).data()),
                "malformed: ASCII text is not ASCII at offset " + std::to_string(place));
    }
  }
}

TEST(BinaryReaderTest, OffsetsAndReferencesOfEverySize) {
  for (std::size_t size = 1; size <= 8; ++size) {
    for (const std::size_t offsetSize : {size, 9 - size}) {
      BinaryDraft draft;
      draft.referenceSize = size;
      draft.offsetSize = offsetSize;
      // As many objects as the smaller size can tell apart, up to those that need three bytes.
      const std::size_t smaller = std::min(size, offsetSize);
      const std::size_t last = smaller == 1 ? 40 : smaller == 2 ? 12'000 : 70'000;
      draft.array({1, last, 2}).array({last - 1, last - 2});
      while (draft.objects.size() <= last) {
        draft.add('\x12' + bigEndianBytes(draft.objects.size(), 4));
      }
      std::string tree = "[[";
      for (const auto& part : {std::to_string(last - 1), ", "s, std::to_string(last - 2), "], "s,
                               std::to_string(last)}) {
        tree += part;
      }
      EXPECT_EQ(outcome(draft.data()), tree + ", 2]");
    }
    BinaryDraft stray;  // in its highest byte
    stray.referenceSize = size;
    EXPECT_EQ(outcome(stray.array({1ULL << (8 * (size - 1))}).data()),
              "malformed: reference is not in the table at offset 9");
  }
}

TEST(BinaryReaderTest, TrailersThatLieAreRefused) {
  const struct {
    std::function<void(BinaryDraft&)> lie;
    std::string outcome;
  } rows[] = {
      {[](auto&) {}, "1"},
      {[](auto& d) { d.offsetSize = 0; }, "malformed: impossible size of offsets at offset 16"},
      {[](auto& d) { d.offsetSize = 9; }, "malformed: impossible size of offsets at offset 25"},
      {[](auto& d) { d.referenceSize = 0; },
       "malformed: impossible size of references at offset 19"},
      {[](auto& d) { d.referenceSize = 9; },
       "malformed: impossible size of references at offset 19"},
      {[](auto& d) { d.root = 1; }, "malformed: top object is not in the table at offset 28"},
      {[](auto& d) { d.objectCount = 0; },
       "malformed: offset table does not fit the object count at offset 20"},
      {[](auto& d) { d.objectCount = (1ULL << 63) + 1; },
       "malformed: offset table does not fit the object count at offset 20"},
      {[](auto& d) { d.tableOffset = 8; }, "malformed: offset table out of bounds at offset 36"},
      {[](auto& d) { d.tableOffset = 12; }, "malformed: offset table out of bounds at offset 36"},
      {[](auto& d) { d.tableOffset = 9; },
       "malformed: offset table does not fit the object count at offset 20"},
      {[](auto& d) { d.tableOffset = UINT64_MAX; },
       "malformed: offset table out of bounds at offset 36"},
      {[](auto& d) { d.offsets = {7}; }, "malformed: object offset out of bounds at offset 10"},
      {[](auto& d) { d.offsets = {10}; }, "malformed: object offset out of bounds at offset 10"},
      {[](auto& d) { d.offsets.assign(2, 8); }, "malformed: objects overlap at offset 8"},
      {[](auto& d) { d.offsets.assign(3, 8); },
       "malformed: more objects than bytes for them at offset 24"},
      {[](auto& d) { d.objects.clear(); },
       "malformed: binary property list cut short at offset 40"},
  };
  for (const auto& row : rows) {
    BinaryDraft draft;
    row.lie(draft.integer(1));
    EXPECT_EQ(outcome(draft.data()), row.outcome);
  }
  std::string other = BinaryDraft().integer(1).text();
  other[7] = '1';
  EXPECT_EQ(outcome(tightMessage(other)),
            "malformed: unknown version of the binary form at offset 6");
}

// S8.
TEST(BinaryReaderTest, EveryWayDownIsMeasuredOnce) {
  // Containers in a row, each `times` in the one before, with parents first or last, which are
  // measured differently; the top one may also hold the last but one, so that what is known of it
  // by then must still count on the long way.
  const auto chain = [](std::size_t containers, std::size_t times, bool parentsFirst, bool short_) {
    BinaryDraft draft;
    draft.referenceSize = 2;
    const auto place = [&](std::size_t depth) {
      return parentsFirst ? depth : containers - 1 - depth;
    };
    draft.root = place(0);
    for (std::size_t i = 0; i < containers; ++i) {
      const std::size_t depth = place(i);
      std::vector<std::uint64_t> children;
      if (depth == 0 && short_) children.push_back(place(containers - 2));
      if (depth + 1 < containers) children.insert(children.end(), times, place(depth + 1));
      draft.array(children);
    }
    return outcome(draft.data(), false);
  };
  const std::string tooDeep =
      "limitExceeded: more than 512 dictionaries and arrays inside one another";
  for (const bool parentsFirst : {true, false}) {
    for (const bool shortWay : {false, true}) {
      EXPECT_EQ(chain(512, 2, parentsFirst, shortWay), "accepted");
      EXPECT_EQ(chain(513, 1, parentsFirst, shortWay), tooDeep);
      EXPECT_EQ(chain(20000, 1, parentsFirst, shortWay), tooDeep);
    }
  }
  BinaryDraft loop;
  loop.root = 2;
  EXPECT_EQ(outcome(loop.array({1}).array({0}).array({0}).data()),
            "malformed: container inside itself at offset 8");
}

TEST(ReaderTest, MessagesPastTheLimitAreRefusedUnread) {
  EXPECT_EQ(outcome(Data(std::string((std::size_t{16} << 20) + 1, 'x'))),
            "limitExceeded: message of 16777217 bytes, more than 16777216");
  EXPECT_TRUE(outcome(Data()).starts_with("malformed: "));
}

}  // namespace
}  // namespace ironmoat::plist
