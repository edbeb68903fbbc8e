#pragma once

#include <array>
#include <concepts>
#include <cstddef>
#include <string_view>
#include <utility>

#include "ironmoat/sparse_field.h"

// Lists of a record's members that the compiler keeps complete and in order, and what is derived
// from them: names, types, a walk over all fields.
namespace ironmoat {

namespace detail {

template <class T>
struct ReadAs {
  using Type = T;
  static constexpr bool sparse = false;
};
template <class R, class T, std::size_t Index>
struct ReadAs<SparseField<R, T, Index>> {
  using Type = Optional<T>;
  static constexpr bool sparse = true;
};

template <auto Member>
struct MemberTraits;
template <class R, class T, T R::*Member>
struct MemberTraits<Member> : ReadAs<T> {
  using Record = R;
  using Stored = T;
};

template <class R>
concept SparseRecord = std::derived_from<R, SparseValues>;

template <auto Member>
constexpr std::string_view prettyName() {
  return __PRETTY_FUNCTION__;  // ... Member = &Namespace::Record::name] or ...::name; std::...]
}

constexpr std::string_view lastIdentifier(std::string_view pretty) {
  const std::size_t end = pretty.find_first_of(";]", pretty.find("Member = "));
  const std::size_t start = pretty.rfind(':', end) + 1;
  return pretty.substr(start, end - start);
}

struct ConvertsToAnything {
  template <class T>
  operator T() const;  // NOLINT(google-explicit-constructor): never defined, only counted with
};
template <std::size_t>
using AnythingAt = ConvertsToAnything;

template <class R, std::size_t... I>
constexpr bool takesInitialisers(std::index_sequence<I...>) {
  if constexpr (SparseRecord<R>) return requires {
      R{SparseValues{}, AnythingAt<I>{}...};
    };
  return requires { R{AnythingAt<I>{}...}; };
}

template <class R>
struct Somewhere {
  static const R record;  // never defined: only the addresses of its members are compared
};

/// `Members` are in the order of their declaration: the sparse ones at the places that are their
/// indices, the others one behind the other in memory. Only g++ can look into memory while
/// compiling.
template <class R, auto... Members>
constexpr bool inOrder() {
  bool ordered = true;
  std::size_t place = 0;
#ifndef __clang__
  const void* before = &Somewhere<R>::record;
#endif
  const auto next = [&]<auto Member>() {
    if constexpr (MemberTraits<Member>::sparse) {
      ordered = ordered && MemberTraits<Member>::Stored::index == place;
    }
    ++place;
#ifndef __clang__
    const void* const at = &(Somewhere<R>::record.*Member);
    if constexpr (MemberTraits<Member>::sparse) {
      ordered = ordered && at == static_cast<const void*>(&Somewhere<R>::record);
    } else {
      ordered = ordered && (place == 1 || before < at);
      before = at;
    }
#endif
  };
  (next.template operator()<Members>(), ...);
  return ordered;
}

}  // namespace detail

/// One member of a record, as a type: what a walk over a record's fields is given.
template <auto Member>
struct Field {
  using Record = typename detail::MemberTraits<Member>::Record;
  /// A sparse field counts as an Optional.
  using Type = typename detail::MemberTraits<Member>::Type;
  using Stored = typename detail::MemberTraits<Member>::Stored;
  static constexpr bool sparse = detail::MemberTraits<Member>::sparse;
  static constexpr std::string_view name = detail::lastIdentifier(detail::prettyName<Member>());

  static Stored& in(Record& record) noexcept { return record.*Member; }
  static const Stored& in(const Record& record) noexcept { return record.*Member; }
};

/// All members of `R`, in the order of their declaration.
template <class R, auto... Members>
struct FieldList {
  static constexpr std::size_t count = sizeof...(Members);
  static constexpr std::array<std::string_view, count> names = {Field<Members>::name...};

  /// Calls `visit(Field<Member>{})` for one member after the other.
  template <class Visitor>
  static constexpr void forEach(Visitor&& visit) {
    (visit(Field<Members>{}), ...);
  }

  static constexpr bool check() {
    static_assert(detail::takesInitialisers<R>(std::make_index_sequence<count>()),
                  "the list names a member that the record does not have, or one of them twice");
    static_assert(!detail::takesInitialisers<R>(std::make_index_sequence<count + 1>()),
                  "a member of the record is missing in its list");
    static_assert(detail::inOrder<R, Members...>(),
                  "the list does not name the members in the order of their declaration");
    return true;
  }
};

}  // namespace ironmoat
