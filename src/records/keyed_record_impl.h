#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <type_traits>
#include <variant>

#include "plist/decoder.h"
#include "plist/encoder.h"
#include "records/keyed_record.h"

/// What a record's .cc derives from its table: checks, decoding, encoding.
namespace ironmoat::records {

/// Does not compile for a table that is not one with its record.
template <class R>
constexpr bool wellFormed() {
  static_assert(Table<R>::rows.keysAreDistinct(), "two rows have the same wire key");
  return detail::overMembers(
      Table<R>::rows, []<auto... Members>() {
        static_assert((detail::hasRule<typename Field<Members>::Type> && ...),
                      "no decoding rule covers a member's type");
        return FieldList<R, Members...>::check();
      });
}

template <class Container, class T, class Keys>
[[nodiscard]] bool decodeField(const Container& container, T& field, Keys key) {
  if constexpr (detail::isRequired<T>) {
    return container.decode(field, key);
  } else {
    // forEach visits a key that is not required only when it has an entry. Said to the compiler,
    // this saves a second test of it for each field; a sanitized build checks.
    if (!container.contains(key)) __builtin_unreachable();
    return container.decodeIfPresent(field, key);
  }
}

template <class R>
[[nodiscard]] bool decodeFields(const plist::Decoder& decoder, R& record) {
  static_assert(wellFormed<R>());
  using Keys = typename R::CodingKeys;
  using Container = plist::KeyedDecodingContainer<Keys>;
  // A scalar by its type, of which there are few: calls to a function for each of 150 fields no
  // processor foretells, nor do so many functions stay in its caches.
  using DecodeOne = bool (*)(const Container&, R&, Keys);
  using Way = std::variant<Optional<String> R::*, Optional<Data> R::*, Optional<Int> R::*,
                           Optional<Int64> R::*, Optional<Bool> R::*, Int R::*, DecodeOne>;
  static constexpr auto ways = detail::overMembers(
      Table<R>::rows, []<auto... Members>() {
        return std::array<Way, Keys::count>{[] {
          if constexpr (std::is_constructible_v<Way, decltype(Members)>) {
            return Way(Members);
          } else {
            return Way(DecodeOne([](const Container& container, R& into, Keys key) {
              return decodeField(container, into.*Members, key);
            }));
          }
        }()...};
      });
  static constexpr auto required = detail::overMembers(
      Table<R>::rows, []<auto... Members>() {
        typename Container::KeySet bits{};
        std::size_t index = 0;
        ((detail::isRequired<typename Field<Members>::Type>
              ? void(bits[index / 64] |= std::uint64_t{1} << (index % 64))
              : void(),
          ++index),
         ...);
        return bits;
      });
  const auto container = decoder.container<Keys>();
  return container && container.forEach(required, [&](Keys key) {
    const auto by = [&](auto way) {
      if constexpr (std::is_member_pointer_v<decltype(way)>) {
        return decodeField(container, record.*way, key);
      } else {
        return way(container, record, key);
      }
    };
    return std::visit(by, ways[key.index()]);
  });
}

/// Writes `record` as a dictionary: required fields always, optional ones when present.
template <class R>
void encodeFields(plist::Encoder& encoder, const R& record) {
  using Keys = typename R::CodingKeys;
  auto container = encoder.container<Keys>();
  std::size_t index = 0;
  const auto encodeOne = [&]<class T>(const T& value) {
    const Keys key = Keys::at(index++);
    if constexpr (detail::isRequired<T>) {
      container.encode(value, key);
    } else {
      container.encodeIfPresent(value, key);
    }
  };
  detail::overMembers(
      Table<R>::rows, [&]<auto... Members>() { (encodeOne(record.*Members), ...); });
}

}  // namespace ironmoat::records

/// Defines decoding and encoding of `Record`; stands once, in the record's .cc.
#define IRONMOAT_KEYED_RECORD(Record)                                                           \
  bool Record::decode(const plist::Decoder& decoder) {                                          \
    return records::decodeFields(decoder, *this);                                               \
  }                                                                                             \
  void Record::encode(plist::Encoder& encoder) const { records::encodeFields(encoder, *this); } \
  static_assert(records::wellFormed<Record>())
