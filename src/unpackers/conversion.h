#pragma once

#include <cstddef>
#include <string_view>
#include <type_traits>
#include <utility>

#include "ironmoat/fields.h"
#include "records/keyed_record.h"

/// From a wire record to the arguments of an output record's initialiser, wired by name and type
/// while compiling.
namespace ironmoat {

/// Converts nothing: every argument passes through.
struct NothingConverted {
  using Fields = FieldList<NothingConverted>;
};

namespace detail {

template <class R>
struct FieldsOf {
  using Type = typename R::Fields;
};
template <class R>
requires requires { typename R::CodingKeys; }
struct FieldsOf<R> {
  using Type = typename std::remove_const_t<decltype(records::Table<R>::rows)>::template Fields<R>;
};

/// Picks a Field out of a list by its place, or void past its end; by overload resolution, which
/// costs the compiler less than walking the list 150 times.
template <std::size_t Index, class F>
struct Placed {};
template <class Places, class List>
struct Placing;
template <std::size_t... I, class R, auto... Members>
struct Placing<std::index_sequence<I...>, FieldList<R, Members...>> : Placed<I, Field<Members>>... {
};
template <std::size_t Index, class F>
F pick(const Placed<Index, F>*);
template <std::size_t Index>
void pick(...);

template <class R>
constexpr std::size_t fieldIndex(std::string_view name) {
  const auto& names = FieldsOf<R>::Type::names;
  std::size_t index = 0;
  while (index < names.size() && names[index] != name) ++index;
  return index;
}
/// The member of `R` that is called `Name::name`, as a Field, or void.
template <class R, class Name>
using FieldNamed = decltype(pick<fieldIndex<R>(Name::name)>(
    static_cast<const Placing<std::make_index_sequence<FieldsOf<R>::Type::count>,
                              typename FieldsOf<R>::Type>*>(nullptr)));

/// Whether a value that was moved from needs no destructor: a number never does; text and data are
/// left without a block, a list without memory; an optional value is left absent or as those.
template <class T>
inline constexpr bool ownsNothingOnceMovedFrom = std::is_trivially_destructible_v<T>;
template <>
inline constexpr bool ownsNothingOnceMovedFrom<String> = true;
template <>
inline constexpr bool ownsNothingOnceMovedFrom<Data> = true;
template <class T>
inline constexpr bool ownsNothingOnceMovedFrom<List<T>> = true;
template <class T>
inline constexpr bool ownsNothingOnceMovedFrom<Optional<T>> = ownsNothingOnceMovedFrom<T>;

/// What happens to the wire record afterwards: it is destroyed, or left as it is.
enum class Wires { destroyed, abandoned };

/// What argument `Argument` is made of: the converted part of its name, else the wire field of its
/// name, which must be of exactly its type. The argument is made of it in place (by way of a
/// temporary each of 150 would cost two copies).
template <class Argument, Wires wires, class Wire, class Converted>
decltype(auto) argumentOf(Wire& wire, Converted& converted) noexcept {
  using Part = FieldNamed<Converted, Argument>;
  using Same = FieldNamed<Wire, Argument>;
  static_assert(!std::is_void_v<Same>, "no wire field has this argument's name");
  static_assert(std::is_nothrow_move_constructible_v<typename Argument::Type>);
  if constexpr (!std::is_void_v<Part>) {
    return std::move(Part::in(converted));
  } else {
    static_assert(std::is_same_v<typename Same::Type, typename Argument::Type>,
                  "the wire field of this argument's name is of another type");
    static_assert(ownsNothingOnceMovedFrom<typename Same::Type>,
                  "nobody destroys the wire field of this argument's name");
    if constexpr (wires == Wires::abandoned &&
                  requires { Same::Type::takenFrom(Same::in(wire)); }) {
      return Same::Type::takenFrom(Same::in(wire));
    } else {
      return std::move(Same::in(wire));
    }
  }
}

template <class Output, Wires wires, class Wire, class Converted>
typename Output::Arguments argumentsFrom(Wire& wire, Converted& converted) noexcept {
  using Arguments = typename Output::Arguments;
  return [&]<auto... Members>(FieldList<Arguments, Members...>) {
    static_assert(sizeof...(Members) == FieldsOf<Wire>::Type::count,
                  "a wire field has no argument");
    return Arguments{argumentOf<Field<Members>, wires>(wire, converted)...};
  }
  (typename Arguments::Fields());
}

}  // namespace detail

/// The arguments for `Output::with`: the parts in `converted`, and every other one moved out of the
/// wire field of its name. By their count and names there is no other field in `wire`.
template <class Output, class Wire, class Converted = NothingConverted>
typename Output::Arguments argumentsFrom(Wire&& wire, Converted&& converted = {}) noexcept {
  static_assert(std::is_rvalue_reference_v<Wire&&>);
  return detail::argumentsFrom<Output, detail::Wires::destroyed>(wire, converted);
}

}  // namespace ironmoat
