#pragma once

#include <cstdint>
#include <limits>
#include <random>
#include <string>

#include "ironmoat/values.h"
#include "records/keyed_record.h"

/// Wire records made and compared by their tables alone.
namespace ironmoat::testing {

template <class R>
constexpr bool isKeyedRecord = requires {
  typename R::CodingKeys;
};

/// `visit(Field<Member>{})` for every row of R's table.
template <class R, class Visitor>
void forEachField(Visitor&& visit) {
  std::remove_const_t<decltype(records::Table<R>::rows)>::template Fields<R>::forEach(visit);
}

class RecordGenerator {
 public:
  /// `presence` of 0 makes every optional field absent, of 1 present.
  RecordGenerator(std::uint64_t seed, double presence) : random_(seed), present_(presence) {}

  template <class R>
  requires isKeyedRecord<R> R make(int depth) {
    R record{};
    forEachField<R>([&](auto field) { fill(field.in(record), depth); });
    return record;
  }

 private:
  void fill(Int& value, int) { value = integer(); }
  void fill(Int64& value, int) { value = integer(); }
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
  template <class R>
  requires isKeyedRecord<R>
  void fill(R& record, int depth) { record = make<R>(depth); }
  template <class T>
  void fill(List<T>& list, int depth) {
    const auto count = depth > 0 ? below(4) : 0;
    for (std::uint64_t i = 0; i < count; ++i) fill(list.emplace_back(), depth - 1);
  }
  template <class T>
  void fill(Optional<T>& value, int depth) {
    if (!present_(random_)) return;
    value = T{};
    fill(*value, depth);
  }

  std::uint64_t below(std::uint64_t bound) { return random_() % bound; }
  std::int64_t integer() {
    static constexpr std::int64_t kEdges[] = {0,
                                              1,
                                              -1,
                                              127,
                                              128,
                                              255,
                                              256,
                                              65535,
                                              65536,
                                              -128,
                                              1L << 31,
                                              1L << 32,
                                              (1L << 32) - 1,
                                              std::numeric_limits<std::int64_t>::min(),
                                              std::numeric_limits<std::int64_t>::max()};
    const auto pick = below(std::size(kEdges) + 2);
    return pick < std::size(kEdges) ? kEdges[pick] : static_cast<std::int64_t>(random_());
  }

  std::mt19937_64 random_;
  std::bernoulli_distribution present_;
};

/// The name of the first field in which two records differ, or nothing.
template <class T>
std::string difference(const T& a, const T& b) {
  return a == b ? "" : "value";
}
template <class R>
requires isKeyedRecord<R> std::string difference(const R& a, const R& b);
template <class T>
std::string difference(const List<T>& a, const List<T>& b) {
  if (a.size() != b.size()) return "length";
  for (std::size_t i = 0; i < a.size(); ++i) {
    if (const std::string inside = difference(a[i], b[i]); !inside.empty()) return inside;
  }
  return "";
}
template <class T>
std::string difference(const Optional<T>& a, const Optional<T>& b) {
  if (a.has_value() != b.has_value()) return "presence";
  return a ? difference(*a, *b) : "";
}
template <class R>
requires isKeyedRecord<R> std::string difference(const R& a, const R& b) {
  std::string first;
  forEachField<R>([&](auto field) {
    if (!first.empty()) return;
    const std::string inside = difference(field.in(a), field.in(b));
    if (!inside.empty()) first = std::string(field.name) + ": " + inside;
  });
  return first;
}

}  // namespace ironmoat::testing
