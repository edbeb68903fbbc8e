#pragma once

#include <cstddef>
#include <memory>
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

/// What argument `Argument` is made of: the converted part of its name, else the wire field of its
/// name, which must be of exactly its type.
template <class Argument, class Wire, class Converted>
auto&& argumentOf(Wire& wire, Converted& converted) noexcept {
  using Part = FieldNamed<Converted, Argument>;
  using Same = FieldNamed<Wire, Argument>;
  static_assert(!std::is_void_v<Same>, "no wire field has this argument's name");
  static_assert(std::is_nothrow_move_constructible_v<typename Argument::Type>);
  if constexpr (!std::is_void_v<Part>) {
    return std::move(Part::in(converted));
  } else {
    static_assert(std::is_same_v<typename Same::Type, typename Argument::Type>,
                  "the wire field of this argument's name is of another type");
    return std::move(Same::in(wire));
  }
}

/// Moves all values of sparse fields at once, and each other field by itself, over one that owns
/// nothing yet.
template <class Arguments, auto... Members, class Wire, class Converted>
Arguments sparseArguments(FieldList<Arguments, Members...>, Wire& wire,
                          Converted& converted) noexcept {
  Arguments arguments;
  static_cast<SparseValues&>(arguments) = std::move(static_cast<SparseValues&>(wire));
  const auto take = [&]<class Argument>(Argument) {
    auto&& from = argumentOf<Argument>(wire, converted);
    if constexpr (Argument::sparse) {
      static_assert(Argument::Stored::index == std::remove_cvref_t<decltype(from)>::index,
                    "the wire field of this argument's name has another place");
    } else {
      std::construct_at(&Argument::in(arguments), std::forward<decltype(from)>(from));
    }
  };
  (take(Field<Members>()), ...);
  return arguments;
}

}  // namespace detail

/// The arguments for `Output::with`: the parts in `converted`, and every other one moved out of the
/// wire field of its name. By their count and names there is no other field in `wire`.
template <class Output, class Wire, class Converted = NothingConverted>
typename Output::Arguments argumentsFrom(Wire&& wire, Converted&& converted = {}) noexcept {
  static_assert(std::is_rvalue_reference_v<Wire&&>);
  using Arguments = typename Output::Arguments;
  return [&]<auto... Members>(FieldList<Arguments, Members...>) {
    static_assert(sizeof...(Members) == detail::FieldsOf<Wire>::Type::count,
                  "a wire field has no argument");
    if constexpr (detail::SparseRecord<Arguments>) {
      return detail::sparseArguments(FieldList<Arguments, Members...>(), wire, converted);
    } else {
      return Arguments{detail::argumentOf<Field<Members>>(wire, converted)...};
    }
  }
  (typename Arguments::Fields());
}

}  // namespace ironmoat
