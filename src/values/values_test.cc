#include "ironmoat/values.h"

#include <gtest/gtest.h>

#include <random>
#include <stdexcept>
#include <string>
#include <string_view>
#include <tuple>
#include <utility>
#include <vector>

#include "ironmoat/sparse_field.h"
#include "values/utf8.h"

namespace ironmoat {
namespace {

TEST(Values, KeepTheirBlockUntilDetached) {
  String kept;
  for (const Sharing sharing : {Sharing::anyThread, Sharing::oneThread}) {
    {
      const detail::Slice whole = detail::Slice::copyOf("one message", sharing);
      kept = String(detail::Slice(whole.block(), 4, 7));
    }
    EXPECT_EQ(kept, String("message"));
  }
  const String own = kept.detached();
  kept = String();
  EXPECT_EQ(own.view(), "message");
}

TEST(Values, HoldZeroBytes) {
  const std::string_view expected("a\0b", 3);
  EXPECT_EQ(String("a\0b").view(), expected);
  EXPECT_EQ(Data("a\0bc", 3).view(), expected);
  EXPECT_EQ(Data(std::vector<unsigned char>{'a', 0, 'b'}).view(), expected);
}

TEST(Utf8, ValidPrefixEndsBeforeTheFirstMalformedSequence) {
  const struct {
    std::string_view text;
    std::size_t valid;
  } rows[] = {
      {"plain and long enough for the wide path", 39},
      {"\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80z", 10},
      {"ab\xC0\x80", 2},
      {"x\xED\xA0\x80", 1},
      {"\xE2\x82", 0},
      {"\xC3(", 0},
      {"\xE2\x82(", 0},
      {"\xE2\x82\xC0", 0},
      {"\xF0\x9F\x98(", 0},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(validUtf8Prefix(row.text), row.valid) << testing::PrintToString(row.text);
  }
  EXPECT_THROW(String("\xff"), std::invalid_argument);
  // No overlong form, no surrogate and nothing past U+10FFFF begins with any two bytes.
  std::size_t sequences = 0;
  for (unsigned lead = 0x80; lead < 0x100; ++lead) {
    for (unsigned second = 0; second < 0x100; ++second) {
      const char text[] = {static_cast<char>(lead), static_cast<char>(second), '\x80', '\xBF'};
      sequences += validUtf8Prefix({text, 4}) >= 2 ? 1 : 0;
    }
  }
  EXPECT_EQ(sequences, 30 * 64 + (32 + 12 * 64 + 32 + 2 * 64) + (48 + 3 * 64 + 16));
}

TEST(Utf8, FindsTheFirstForeignByteOfAsciiAtEveryPosition) {
  for (std::size_t length = 1; length <= 40; ++length) {
    std::string text(length, 'x');
    EXPECT_TRUE(isAscii(text));
    for (std::size_t at = 0; at < length; ++at) {
      text[at] = '\x80';
      EXPECT_FALSE(isAscii(text)) << length;
      EXPECT_EQ(validUtf8Prefix(text), at);
      text[at] = 'x';
    }
  }
}

TEST(Utf8, WrittenCharactersAreValidAndComeBackAsUtf16) {
  for (char32_t c = 0; c < 0x110000; ++c) {
    if (c == 0xD800) c = 0xE000;
    char bytes[4];
    const std::string_view text(bytes, writeUtf8(c, bytes));
    ASSERT_TRUE(isValidUtf8(text)) << static_cast<std::uint32_t>(c);
    const std::u16string units = utf16FromUtf8(text);
    const char32_t back =
        units.size() == 1 ? units[0] : 0x10000 + ((units[0] & 0x3FFU) << 10) + (units[1] & 0x3FFU);
    ASSERT_EQ(back, c);
  }
}

/// Fields in each word of presence bits, at its edges.
struct Sparse : detail::SparseValues {
  template <class T, std::size_t Index>
  using Field = SparseField<Sparse, T, Index>;
  [[no_unique_address]] Field<String, 0> first;
  [[no_unique_address]] Field<Int, 1> number;
  [[no_unique_address]] Field<String, 63> text;
  [[no_unique_address]] Field<Data, 64> data;
  [[no_unique_address]] Field<Int64, 100> wide;
  [[no_unique_address]] Field<Bool, 128> truth;
  [[no_unique_address]] Field<String, 191> last;
};
/// The same fields, each with memory of its own.
using Dense = std::tuple<Optional<String>, Optional<Int>, Optional<String>, Optional<Data>,
                         Optional<Int64>, Optional<Bool>, Optional<String>>;
Dense denseCopy(const Sparse& s) {
  return {s.first, s.number, s.text, s.data, s.wide, s.truth, s.last};
}

/// Resets the field (0), or gives it a value.
template <class Field>
void change(Field& field, unsigned to) {
  using T = std::remove_cvref_t<decltype(*field)>;
  if (to == 0) return field.reset();
  if constexpr (std::is_arithmetic_v<T>) {
    field = static_cast<T>(to);
  } else {
    field = T(std::string(to - 1, 'x'));  // empty ones, too
  }
}

TEST(SparseField, HoldsWhatAnOptionalWouldInAnyOrderOfChanges) {
  std::mt19937 random(1);  // NOLINT(cert-msc51-cpp): the same each time
  for (int round = 0; round < 200; ++round) {
    Sparse sparse;
    Dense dense;
    for (int changes = 0; changes < 30; ++changes) {
      std::size_t left = random() % 7;
      const unsigned to = random() % 3;
      const auto each = [&](auto& field) {
        if (left-- == 0) change(field, to);
      };
      const std::size_t which = left;
      each(sparse.first), each(sparse.number), each(sparse.text), each(sparse.data);
      each(sparse.wide), each(sparse.truth), each(sparse.last);
      left = which;
      std::apply([&](auto&... fields) { (each(fields), ...); }, dense);
      ASSERT_EQ(denseCopy(sparse), dense);
    }
    const Sparse copy = sparse;
    Sparse assigned;
    assigned.last = String("replaced");
    assigned = copy;
    const Sparse moved = std::move(sparse);
    for (const Sparse& each : {copy, assigned, moved}) EXPECT_EQ(denseCopy(each), dense);
    EXPECT_EQ(denseCopy(sparse), Dense());  // NOLINT(bugprone-use-after-move)
    assigned = std::move(assigned = Sparse());
    EXPECT_EQ(denseCopy(assigned), Dense());
  }
}

TEST(SparseField, ReadsAsAnOptional) {
  Sparse record;
  EXPECT_THROW(static_cast<void>(record.text.value()), std::bad_optional_access);
  EXPECT_EQ(record.number.value_or(7), 7);
  record.first = record.text = String("a text");
  record.number = 5;
  EXPECT_TRUE(record.text && record.text.has_value() && record.first == String("a text"));
  EXPECT_EQ(record.text->view().data(), record.first.value().view().data());  // one block
  ++*record.number;
  EXPECT_EQ(record.number.value_or(7), 6);
}

}  // namespace
}  // namespace ironmoat
