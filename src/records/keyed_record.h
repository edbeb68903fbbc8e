#pragma once

#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>

#include "ironmoat/fields.h"
#include "ironmoat/values.h"
#include "records/key_index.h"

/// The rules that all wire records share. A record is a struct, and after it a table:
///
///     struct Example {
///       using CodingKeys = records::CodingKeys<Example>;
///       Int command = 0;
///       Optional<String> name;
///       [[nodiscard]] bool decode(const plist::Decoder& decoder);
///       void encode(plist::Encoder& encoder) const;
///     };
///     template <>
///     struct records::Table<Example> {
///       using R = Example;
///       static constexpr KeyTable rows{
///           row<&R::command>("c"),
///           row<&R::name>("n"),
///       };
///     };
///
/// and in its .cc `IRONMOAT_KEYED_RECORD(Example)`, from keyed_record_impl.h. A plain member is
/// required, an optional one may be absent. A row that is missing, out of order, of an unsupported
/// type or with another row's key does not compile.
///
/// `decode` fills a record that is freshly made, its fields in table order, and returns whether it
/// did; the first field that is rejected ends it (plist/decoder.h says how).
namespace ironmoat::plist {
class Decoder;
class Encoder;
}  // namespace ironmoat::plist

namespace ironmoat::records {

template <class R>
struct Table;

template <auto Member>
struct Row {
  std::string_view key;
};
template <auto Member>
constexpr Row<Member> row(std::string_view wireKey) {
  return {wireKey};
}

template <auto... Members>
struct KeyTable {
  static constexpr std::size_t count = sizeof...(Members);
  template <class R>
  using Fields = FieldList<R, Members...>;

  std::array<std::string_view, count> keys;

  constexpr KeyTable(Row<Members>... rows)  // NOLINT(google-explicit-constructor)
      : keys{rows.key...} {}

  [[nodiscard]] constexpr bool keysAreDistinct() const {
    for (std::size_t i = 0; i < count; ++i) {
      for (std::size_t j = 0; j < i; ++j) {
        if (keys[i] == keys[j]) return false;
      }
    }
    return true;
  }
};

namespace detail {

template <class T>
constexpr bool isRecord = requires {
  typename T::CodingKeys;
};

template <class T>
struct Rule {
  static constexpr bool optional = isRecord<T>;
};
template <class T>
requires std::same_as<T, Int> || std::same_as<T, Int64> || std::same_as<T, Bool> ||
    std::same_as<T, String> || std::same_as<T, Data> || std::same_as<T, List<String>>
struct Rule<T> {
  static constexpr bool optional = true;
};
template <class T>
requires isRecord<T>
struct Rule<List<T>> {
  static constexpr bool optional = true;
};

template <class T>
constexpr bool isRequired = std::same_as<T, Int>;
template <class T>
constexpr bool hasRule = isRequired<T>;
template <class T>
constexpr bool hasRule<Optional<T>> = Rule<T>::optional;

/// `visit.template operator()<Member>(case index)` for every row.
template <auto... Members, class Visitor>
constexpr auto overMembers(const KeyTable<Members...>&, Visitor&& visit) {
  return visit.template operator()<Members...>();
}

}  // namespace detail

/// The key enumeration of record `R`: one case for each row, in the order of the rows.
template <class R>
class CodingKeys {
 public:
  static constexpr std::size_t count = Table<R>::rows.count;

  /// The case at a position in the table. Requires index < count.
  static constexpr CodingKeys at(std::size_t index) { return CodingKeys(index); }
  /// The case of a member.
  template <auto Member>
  static constexpr CodingKeys of() {
    constexpr std::size_t index = indexOf(Field<Member>::name);
    static_assert(index < count, "the member is not in the record's table");
    return CodingKeys(index);
  }

  [[nodiscard]] constexpr std::size_t index() const { return index_; }
  /// The case's own name: that of the field.
  [[nodiscard]] constexpr std::string_view name() const { return names()[index_]; }

  [[nodiscard]] constexpr const std::string_view& stringValue() const {
    return Table<R>::rows.keys[index_];
  }
  [[nodiscard]] constexpr const std::string_view& rawValue() const { return stringValue(); }
  /// Keys have no integer form.
  [[nodiscard]] constexpr std::optional<Int> intValue() const { return std::nullopt; }

  static std::optional<CodingKeys> fromStringValue(std::string_view text) {
    const std::size_t place = finder().find(text);
    return place == kNoKey ? std::nullopt : std::optional(CodingKeys(place));
  }
  static std::optional<CodingKeys> fromRawValue(std::string_view text) {
    return fromStringValue(text);
  }
  static constexpr std::optional<CodingKeys> fromIntValue(Int) { return std::nullopt; }

  [[nodiscard]] std::string description() const {
    return "CodingKeys(stringValue: \"" + std::string(stringValue()) + "\", intValue: nil)";
  }
  [[nodiscard]] std::string debugDescription() const { return description(); }

  friend constexpr bool operator==(CodingKeys a, CodingKeys b) { return a.index_ == b.index_; }

  /// Maps text to the position of a case. Built on first use and only read afterwards.
  static const KeyIndex& finder() {
    static const KeyIndex index(Table<R>::rows.keys);
    return index;
  }

 private:
  explicit constexpr CodingKeys(std::size_t index) : index_(static_cast<std::uint8_t>(index)) {
    static_assert(count <= kMaxKeys);
  }
  static constexpr const std::array<std::string_view, count>& names() {
    return std::remove_const_t<decltype(Table<R>::rows)>::template Fields<R>::names;
  }
  static constexpr std::size_t indexOf(std::string_view name) {
    std::size_t index = 0;
    while (index < count && names()[index] != name) ++index;
    return index;
  }

  std::uint8_t index_;
};

}  // namespace ironmoat::records

template <class R>
struct std::hash<ironmoat::records::CodingKeys<R>> {
  std::size_t operator()(ironmoat::records::CodingKeys<R> key) const noexcept {
    return std::hash<std::string_view>()(key.stringValue());
  }
};
