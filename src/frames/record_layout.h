#pragma once

#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>

#include "frames/record_codec.h"
#include "ironmoat/fields.h"
#include "ironmoat/values.h"

/// What is known of an encoded record while compiling.
namespace ironmoat::frames {

template <class T>
concept Number = std::same_as<T, Int> || std::same_as<T, Int64>;
template <class T>
concept Scalar = Number<T> || std::same_as<T, Bool>;
template <class T>
concept Text = std::same_as<T, String> || std::same_as<T, Data>;
template <class T>
concept Record = requires {
  typename T::Arguments::Fields;
};

template <class T>
constexpr bool isOptional = false;
template <class T>
constexpr bool isOptional<Optional<T>> = true;

template <class T>
constexpr bool isList = false;
template <class T>
constexpr bool isList<List<T>> = true;

template <class A, class Fields = typename A::Fields>
struct Layout;

/// Bytes of a value without what is only known at run time (text, elements, a record's fields).
template <class T>
constexpr std::size_t fixedBytes() {
  if constexpr (isOptional<T>) return fixedBytes<typename T::value_type>();
  if constexpr (Number<T>) return 8;
  if constexpr (std::same_as<T, Bool>) return 1;
  if constexpr (Record<T>) return 0;
  return 4;
}

/// The fewest bytes that any value of T takes.
template <class T>
constexpr std::size_t leastBytes() {
  if constexpr (isOptional<T>) {
    return 0;
  } else if constexpr (Record<T>) {
    return Layout<typename T::Arguments>::least;
  } else {
    return fixedBytes<T>();
  }
}

template <class A, auto... Members>
struct Layout<A, FieldList<A, Members...>> {
  static constexpr std::size_t presence = (sizeof...(Members) + 7) / 8;
  static constexpr std::size_t fixed =
      presence + (fixedBytes<typename Field<Members>::Type>() + ...);
  static constexpr std::size_t least =
      presence + (leastBytes<typename Field<Members>::Type>() + ...);

  using Bits = std::array<std::uint8_t, presence>;
  /// The bits of the fields that are always there.
  static constexpr Bits required = [] {
    Bits bits{};
    std::size_t i = 0;
    ((bits[i / 8] |=
      static_cast<std::uint8_t>(!isOptional<typename Field<Members>::Type> << (i % 8)),
      ++i),
     ...);
    return bits;
  }();
  /// The bits of the last byte that belong to no field.
  static constexpr std::uint8_t unusedInLast =
      sizeof...(Members) % 8 == 0 ? 0 : static_cast<std::uint8_t>(0xFF << (sizeof...(Members) % 8));
};

[[noreturn, gnu::cold, gnu::noinline]] inline void refuse(const char* sentence) {
  throw RecordError(sentence);
}

}  // namespace ironmoat::frames
