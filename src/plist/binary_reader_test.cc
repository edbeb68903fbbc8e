#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/binary_builder.h"
#include "support/rows.h"
#include "support/show_document.h"

namespace ironmoat::plist {
namespace {

using namespace std::string_literals;
using ironmoat::testing::bigEndianBytes;
using ironmoat::testing::BinaryBuilder;

/// What becomes of a message whose only object is `object`.
std::string outcomeOf(const std::string& object) {
  return readOutcome(BinaryBuilder().add(object).text());
}

TEST(BinaryReader, GivesTheOutcomesOfTheRows) {
  testing::forEachRow("binary_reader", [](const std::string& outcome, const std::string& message) {
    EXPECT_EQ(readOutcome(message), outcome) << ::testing::PrintToString(message);
  });
  // The bytes behind a text complete no pair.
  const std::string dc = "\xDC"s.append(24, '\x02');
  EXPECT_EQ(readOutcome(BinaryBuilder().add("\x61\xD8\x3D"s).add(dc).ascii("k").text()),
            "malformed: not a valid surrogate pair at offset 9");
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
