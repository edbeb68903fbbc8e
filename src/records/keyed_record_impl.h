#pragma once

#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>

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
    return container.decodeIfPresent(field, key);
  }
}

/// The kind of value that a sparse field of type T takes.
template <plist::Scalar T>
constexpr plist::Kind kindFor() {
  if constexpr (std::same_as<T, String>) return plist::Kind::string;
  if constexpr (std::same_as<T, Data>) return plist::Kind::data;
  if constexpr (std::same_as<T, Bool>) return plist::Kind::boolean;
  return plist::Kind::integer;
}

/// Decodes the fields that have an entry or need one. Sparse ones differ in nothing but the kind of
/// their value, so that no branch depends on which of them a message has.
template <class R>
[[nodiscard]] bool decodeSparse(const plist::Decoder& decoder, R& record) {
  using Keys = typename R::CodingKeys;
  using Container = plist::KeyedDecodingContainer<Keys>;
  struct Way {
    plist::Kind kind;  // of a sparse field
    bool (*other)(const Container&, R&, Keys) = nullptr;
  };
  static constexpr auto ways = detail::overMembers(
      Table<R>::rows, []<auto... Members>() {
        return std::array<Way, Keys::count>{[] {
          if constexpr (Field<Members>::sparse) {
            return Way{kindFor<typename Field<Members>::Stored::value_type>()};
          } else {
            return Way{plist::Kind::null, [](const Container& container, R& into, Keys key) {
                         return decodeField(container, into.*Members, key);
                       }};
          }
        }()...};
      });
  static constexpr auto bitsOf = [](auto chosen) {
    return detail::overMembers(
        Table<R>::rows, [&]<auto... Members>() {
          typename Container::KeySet bits{};
          std::size_t index = 0;
          ((bits[index / 64] |= std::uint64_t{chosen(Field<Members>())} << (index % 64), ++index),
           ...);
          return bits;
        });
  };
  static constexpr auto sparse = bitsOf([](auto field) { return field.sparse; });
  static constexpr auto required =
      bitsOf([](auto field) { return detail::isRequired<typename decltype(field)::Type>; });
  const auto container = decoder.container<Keys>();
  if (!container) return false;
  const std::size_t count = container.countOf(sparse);
  if (!decoder.chargeRecords(count, sizeof(ironmoat::detail::Cell))) return false;
  decoder.reserve(record, count);
  plist::References references = decoder.document().references(count);
  return container.forEach(required, [&](Keys key) {
    const Way& way = ways[key.index()];
    return way.other == nullptr ? container.append(record, key, way.kind, references)
                                : way.other(container, record, key);
  });
}

template <class R>
[[nodiscard]] bool decodeFields(const plist::Decoder& decoder, R& record) {
  static_assert(wellFormed<R>());
  using Keys = typename R::CodingKeys;
  if constexpr (ironmoat::detail::SparseRecord<R>) {
    return decodeSparse(decoder, record);
  } else {
    const auto container = decoder.container<Keys>();
    return container &&
           detail::overMembers(
               Table<R>::rows, [&]<auto... Members>() {
                 return (decodeField(container, record.*Members, Keys::template of<Members>()) &&
                         ...);
               });
  }
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
