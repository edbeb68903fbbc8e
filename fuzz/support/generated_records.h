#pragma once

#include <concepts>
#include <cstdint>
#include <limits>
#include <random>
#include <string>
#include <utility>

#include "ironmoat/values.h"

/// Random records, generated from their lists of fields.
namespace ironmoat::testing {

/// The FieldList of a record. Specialised for records that are not output records.
template <class R>
struct FieldsOf {};
template <class R>
requires requires { typename R::Arguments::Fields; }
struct FieldsOf<R> {
  using List = typename R::Arguments::Fields;
};
template <class T>
concept Record = requires {
  typename FieldsOf<T>::List;
};

/// `Random` returns numbers of 64 bits.
template <class Random>
class BasicRecordGenerator {
 public:
  /// `presence` is the probability of an optional field.
  BasicRecordGenerator(Random random, double presence)
      : random_(std::move(random)), presence_(presence) {}

  /// Lists nest at most `depth` deep.
  template <Record R>
  R make(int depth) {
    const auto filled = [&](auto parts) {
      FieldsOf<R>::List::forEach([&](auto field) { fill(field.in(parts), depth); });
      return parts;
    };
    if constexpr (requires { typename R::Arguments; }) {
      return R::with(filled(typename R::Arguments{}));
    } else {
      return filled(R{});
    }
  }

 private:
  void fill(std::integral auto& value, int) { value = integer(); }
  void fill(Bool& value, int) { value = below(2) == 1; }
  void fill(String& value, int) {
    static constexpr const char* kPieces[] = {
        "a", "<&>\"'", "\r\n\t ", "\xC3\xA9", "\xE2\x82\xAC", "\xF0\x9F\x98\x80", "]]>", "&amp;"};
    std::string text;
    for (auto left = below(6); left > 0; --left) text += kPieces[below(std::size(kPieces))];
    value = String(std::string_view(text));
  }
  void fill(Data& value, int) {
    std::string bytes;
    for (auto left = below(20); left > 0; --left) bytes += static_cast<char>(random_());
    value = Data(std::string_view(bytes));
  }
  template <class T>
  void fill(List<T>& list, int depth) {
    for (auto left = depth > 0 ? below(4) : 0; left > 0; --left) list.push_back(some<T>(depth - 1));
  }
  template <class Optional>
  requires requires(Optional value) { value.has_value(); }
  void fill(Optional& value, int depth) {
    if (present()) value = some<typename Optional::value_type>(depth);
  }
  template <class T>
  T some(int depth) {
    if constexpr (Record<T>) {
      return make<T>(depth);
    } else {
      T value{};
      fill(value, depth);
      return value;
    }
  }

  /// False when `random_` returns 0, unless the probability is 1.
  bool present() { return presence_ >= 1 - static_cast<double>(random_() >> 11) * 0x1p-53; }
  std::uint64_t below(std::uint64_t bound) { return random_() % bound; }
  /// The minimum, the maximum, or a number of up to 64 bits and either sign.
  std::int64_t integer() {
    using Limits = std::numeric_limits<std::int64_t>;
    const auto pick = below(66);
    if (pick > 63) return pick == 64 ? Limits::min() : Limits::max();
    return static_cast<std::int64_t>(random_()) >> pick;
  }

  Random random_;
  double presence_;
};
class RecordGenerator : public BasicRecordGenerator<std::mt19937_64> {
 public:
  RecordGenerator(std::uint64_t seed, double presence)
      : BasicRecordGenerator(std::mt19937_64(seed), presence) {}
};

}  // namespace ironmoat::testing
