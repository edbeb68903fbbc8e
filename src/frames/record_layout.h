#pragma once

#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <string>

#include "frames/record_codec.h"
#include "ironmoat/fields.h"
#include "ironmoat/values.h"
#include "values/record_traits.h"

/// The parts of an encoded record that its type determines.
namespace ironmoat::frames {

template <class T>
concept Number = std::same_as<T, Int> || std::same_as<T, Int64>;
template <class T>
concept Scalar = Number<T> || std::same_as<T, Bool>;
template <class T>
concept Text = std::same_as<T, String> || std::same_as<T, Data>;

template <class A, class Fields = typename A::Fields>
struct Layout;

/// Bytes of a value without those that only its content determines: text, elements, a record's
/// fields.
template <class T>
constexpr std::size_t fixedBytes() {
  if constexpr (kIsOptional<T>) return fixedBytes<typename T::value_type>();
  if constexpr (Number<T>) return 8;
  if constexpr (std::same_as<T, Bool>) return 1;
  if constexpr (Record<T>) return 0;
  return 4;
}

/// The fewest bytes of a value of T.
template <class T>
constexpr std::size_t minBytes() {
  if constexpr (kIsOptional<T>) {
    return 0;
  } else if constexpr (Record<T>) {
    return Layout<typename T::Arguments>::minimum;
  } else {
    return fixedBytes<T>();
  }
}

template <class A, auto... Members>
struct Layout<A, FieldList<A, Members...>> {
  static constexpr std::size_t presence = (sizeof...(Members) + 7) / 8;
  static constexpr std::size_t fixed =
      presence + (fixedBytes<typename Field<Members>::Type>() + ...);
  static constexpr std::size_t minimum =
      presence + (minBytes<typename Field<Members>::Type>() + ...);

  using Bits = std::array<std::uint8_t, presence>;
  /// The bits of the fields that are always present.
  static constexpr Bits required = [] {
    Bits bits{};
    std::size_t i = 0;
    ((bits[i / 8] |=
      static_cast<std::uint8_t>(!kIsOptional<typename Field<Members>::Type> << (i % 8)),
      ++i),
     ...);
    return bits;
  }();
  /// The bits of the last byte without a field.
  static constexpr std::uint8_t unusedInLast =
      sizeof...(Members) % 8 == 0 ? 0 : static_cast<std::uint8_t>(0xFF << (sizeof...(Members) % 8));
};

[[noreturn, gnu::cold, gnu::noinline]] inline void reject(const char* description) {
  throw RecordError(description);
}
[[noreturn, gnu::cold, gnu::noinline]] inline void rejectExcess(const char* what, std::size_t limit,
                                                                const char* unit) {
  throw RecordError(std::string(what) + " exceeds the limit of " + std::to_string(limit) + ' ' +
                    unit);
}

}  // namespace ironmoat::frames
