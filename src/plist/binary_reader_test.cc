#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "support/binary_builder.h"
#include "support/show_document.h"

namespace ironmoat::plist {
namespace {

using namespace std::string_literals;
using ironmoat::testing::bigEndianBytes;
using ironmoat::testing::BinaryBuilder;

const std::string kMax = bigEndianBytes(UINT64_MAX, 8);
const std::string kTopBit = bigEndianBytes(1ULL << 63, 8);
const std::string kOne = bigEndianBytes(1, 8);
const std::string kZero = bigEndianBytes(0, 8);

/// What becomes of a message whose only object is `object`.
std::string outcomeOf(const std::string& object) {
  return readOutcome(BinaryBuilder().add(object).text());
}

TEST(BinaryReader, ReadsEveryKindOfObject) {
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
      {"\x14" + kMax + kZero, "wide integer"},
      {"\x14" + kOne + kZero, "wide integer"},
      {"\x14" + kMax + bigEndianBytes(UINT64_MAX - 1, 8), "-2"},
      {"\x22"s + "1234", "real"},
      {"\x23"s + "12345678", "real"},
      {"\x33"s + "12345678", "date"},
      {"\x80"s + "1", "UID"},
      {"\x8F"s + "1234567812345678", "UID"},
      {"\x5F\x10\x01"s + "x", "\"x\""},
      {"\x64\xD8\x00\xDC\x00\xDB\xFF\xDF\xFF"s, "\"\xF0\x90\x80\x80\xF4\x8F\xBF\xBF\""},
      {"\x64\x00\x80\xD7\xFF\xE0\x00\x00z"s, "\"\xC2\x80\xED\x9F\xBF\xEE\x80\x80z\""},
      {"\x63\x00\x00\xFF\xFE\x00z"s, "\"\0\xEF\xBF\xBEz\""s},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(outcomeOf(row.object), row.tree) << ::testing::PrintToString(row.object);
  }
  const std::string longLength = "\x4F\x13"s + bigEndianBytes(2, 8) + "ab";
  EXPECT_EQ(readOutcome(BinaryBuilder().add("\xC2\x01\x02"s).add(longLength).integer(7).text()),
            "set [data \"ab\", 7]");
}

TEST(BinaryReader, AcceptsOnlyTheMarkersOfTheFormat) {
  std::string complete;  // without a byte behind the marker
  for (int marker = 0; marker < 256; ++marker) {
    const std::string object(1, static_cast<char>(marker));
    if (!outcomeOf(object).starts_with("malformed")) complete += object;
  }
  EXPECT_EQ(complete, "\x00\x08\x09\x40\x50\x60\xA0\xC0\xD0"s);
  for (const char marker : "\x0F\x15\x21\x24\x32\x34\x71\x91\xB1\xE1\xF1"s) {
    EXPECT_EQ(outcomeOf(std::string(1, marker) + std::string(32, '\0')),
              "malformed: not a valid object marker at offset 8")
        << int{marker};
  }
}

TEST(BinaryReader, RejectsMalformedObjectsWithReasonAndOffset) {
  const std::string many(32, 'x');
  const std::string badPair = "not a valid surrogate pair at offset 9";
  const struct {
    std::string reason;
    std::vector<std::string> objects;
  } rows[] = {
      {"object exceeds the object area at offset 8",
       {"\x43"s + "ab", "\x80", "\x4F", "\x4F\x10", "\x6F\x13" + kTopBit, "\xAF\x13" + kMax,
        "\xA3\x00"s, "\xDF\x13" + kTopBit}},
      {"not a valid length at offset 9",
       {"\x4F\x23" + many, "\x4F\x0F" + many, "\x4F\x14" + kZero + kZero, "\x6F\x23" + many,
        "\xAF\x23" + many}},
      {"not a valid reference at offset 9", {"\xA1\x01"}},
      {"not a valid reference at offset 10", {"\xA3\x00\x01\x00"s}},
      {"not a valid reference at offset 11", {"\xA3\x00\x00\x01"s}},
      {badPair,
       {"\x61\xD8\x3D", "\x62\xD8\x3D\x00\x41"s, "\x62\xDE\x00\xDE\x00"s, "\x62\xDF\xFF\xDE\x00"s}},
      {"not a valid surrogate pair at offset 11", {"\x62\x00\x41\xDE\x00"s}},
      {"reference cycle not allowed at offset 8", {"\xA1\x00"s, "\xC1\x00"s}},
      {"not a valid dictionary key: expected string, found dictionary at offset 8",
       {"\xD1\x00\x00"s}},
  };
  for (const auto& row : rows) {
    for (const std::string& object : row.objects) {
      EXPECT_EQ(outcomeOf(object), "malformed: " + row.reason) << ::testing::PrintToString(object);
    }
  }
  // The bytes behind a text complete no pair.
  const std::string dc = "\xDC"s.append(24, '\x02');
  EXPECT_EQ(readOutcome(BinaryBuilder().add("\x61\xD8\x3D"s).add(dc).ascii("k").text()),
            "malformed: " + badPair);
}

TEST(BinaryReader, RejectsForeignBytesInAsciiAtEveryPosition) {
  for (std::size_t length = 1; length <= 40; ++length) {
    const std::string text(length, 'x');
    // The byte behind the text is not part of it.
    EXPECT_EQ(readOutcome(BinaryBuilder().ascii(text).add("\x80z").text()), "\""s + text + "\"");
    for (std::size_t at = 0; at < length; ++at) {
      std::string wrong = text;
      wrong[at] = '\x80';
      const std::size_t offset = (length < 15 ? 9 : 11) + at;
      EXPECT_EQ(readOutcome(BinaryBuilder().ascii(wrong).text()),
                "malformed: not a valid ASCII character at offset " + std::to_string(offset));
    }
  }
}

TEST(BinaryReader, ReadsOffsetsAndReferencesOfEverySize) {
  for (std::size_t size = 1; size <= 8; ++size) {
    for (const std::size_t offsetSize : {size, 9 - size}) {
      BinaryBuilder builder;
      builder.referenceSize = size;
      builder.offsetSize = offsetSize;
      // As many objects as the smaller size can tell apart, up to those that need three bytes.
      const std::size_t smaller = std::min(size, offsetSize);
      const std::size_t last = smaller == 1 ? 40 : smaller == 2 ? 12'000 : 70'000;
      builder.array({1, last, 2}).array({last - 1, last - 2});
      while (builder.objects.size() <= last) {
        builder.add('\x12' + bigEndianBytes(builder.objects.size(), 4));
      }
      const auto number = [](std::size_t value) { return std::to_string(value); };
      EXPECT_EQ(readOutcome(builder.text()),
                "[[" + number(last - 1) + ", " + number(last - 2) + "], " + number(last) + ", 2]");
    }
    BinaryBuilder stray;  // in its highest byte
    stray.referenceSize = size;
    EXPECT_EQ(readOutcome(stray.array({1ULL << (8 * (size - 1))}).text()),
              "malformed: not a valid reference at offset 9");
  }
}

TEST(BinaryReader, RejectsMalformedTrailersWithReasonAndOffset) {
  const std::string badCount = "not a valid object count for the offset table at offset 20";
  const std::string badTable = "not a valid position of the offset table at offset 36";
  const std::string badOffset = "not a valid object offset at offset 10";
  const struct {
    std::function<void(BinaryBuilder&)> change;
    std::string reason;
  } rows[] = {
      {[](auto& b) { b.offsetSize = 0; }, "not a valid offset size: 0 at offset 16"},
      {[](auto& b) { b.offsetSize = 9; }, "not a valid offset size: 9 at offset 25"},
      {[](auto& b) { b.referenceSize = 0; }, "not a valid reference size: 0 at offset 19"},
      {[](auto& b) { b.referenceSize = 9; }, "not a valid reference size: 9 at offset 19"},
      {[](auto& b) { b.root = 1; }, "not a valid top object at offset 28"},
      {[](auto& b) { b.objectCount = 0; }, badCount},
      {[](auto& b) { b.objectCount = (1ULL << 63) + 1; }, badCount},
      {[](auto& b) { b.tableOffset = 9; }, badCount},
      {[](auto& b) { b.tableOffset = 8; }, badTable},
      {[](auto& b) { b.tableOffset = 12; }, badTable},
      {[](auto& b) { b.tableOffset = UINT64_MAX; }, badTable},
      {[](auto& b) { b.offsets = {7}; }, badOffset},
      {[](auto& b) { b.offsets = {10}; }, badOffset},
      {[](auto& b) { b.offsets.assign(2, 8); }, "overlapping objects not allowed at offset 8"},
      {[](auto& b) { b.offsets.assign(3, 8); },
       "object count exceeds the object area at offset 24"},
      {[](auto& b) { b.objects.clear(); }, "unexpected end of message at offset 40"},
  };
  for (const auto& row : rows) {
    BinaryBuilder builder;
    row.change(builder.integer(1));
    EXPECT_EQ(readOutcome(builder.text()), "malformed: " + row.reason);
  }
  std::string other = BinaryBuilder().integer(1).text();
  other[7] = '1';
  EXPECT_EQ(readOutcome(other), "malformed: not a valid version of the binary format at offset 6");
}

// S8.
TEST(BinaryReader, NestingLimitHoldsForSharedSubgraphsAndCycles) {
  // Containers in a row, each `times` in the one before, with parents first or last, which are
  // measured differently. The top one may also hold the last but one, whose height is then known
  // before the long way to it is measured.
  const auto isTooDeep = [](std::size_t containers, std::size_t times, bool parentsFirst,
                            bool both) {
    BinaryBuilder builder;
    builder.referenceSize = 2;
    const auto position = [&](std::size_t depth) {
      return parentsFirst ? depth : containers - 1 - depth;
    };
    builder.root = position(0);
    for (std::size_t i = 0; i < containers; ++i) {
      const std::size_t depth = position(i);
      std::vector<std::uint64_t> children;
      if (depth == 0 && both) children.push_back(position(containers - 2));
      if (depth + 1 < containers) children.insert(children.end(), times, position(depth + 1));
      builder.array(children);
    }
    Document document;
    const auto rejection = read(builder.data(), document);  // the tree may have 2^512 leaves
    return rejection && rejection->kind() == DecodingError::Kind::limitExceeded;
  };
  for (const bool parentsFirst : {true, false}) {
    for (const bool both : {false, true}) {
      EXPECT_FALSE(isTooDeep(512, 2, parentsFirst, both));
      EXPECT_TRUE(isTooDeep(513, 1, parentsFirst, both));
      EXPECT_TRUE(isTooDeep(20000, 1, parentsFirst, both));
    }
  }
  // A chain to a container whose only child was measured on another way.
  for (const std::size_t length : {310U, 311U}) {
    BinaryBuilder builder;
    const auto row = [&](std::size_t containers) {
      for (std::size_t i = 1; i < containers; ++i) builder.array({builder.objects.size() + 1});
    };
    builder.referenceSize = 2;
    builder.array({1, 201, 202});
    row(200);
    builder.array({}).array({1});
    row(length);
    builder.array({201});
    EXPECT_EQ(readOutcome(builder.text()).starts_with("limitExceeded"), length == 311);
  }
  BinaryBuilder loop;
  loop.root = 2;
  EXPECT_EQ(readOutcome(loop.array({1}).array({0}).array({0}).text()),
            "malformed: reference cycle not allowed at offset 8");
}

TEST(Reader, RejectsMessagesThatExceedTheSizeLimit) {
  const std::size_t limit = std::size_t{16} << 20;
  EXPECT_EQ(readOutcome(std::string(limit + 1, ' ')),
            "limitExceeded: message size exceeds the limit of 16777216 bytes: 16777217");
  EXPECT_EQ(readOutcome(std::string(limit, ' ')),
            "malformed: unexpected end of message at offset 16777216");
  EXPECT_EQ(readOutcome(""), "malformed: unexpected end of message at offset 0");
}

}  // namespace
}  // namespace ironmoat::plist
