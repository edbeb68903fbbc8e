#pragma once

#include <array>
#include <cstddef>
#include <string_view>
#include <utility>

// Lists of a record's members that the compiler keeps complete and in order, and what is derived
// from them: names, types, a walk over all fields.
namespace ironmoat {

namespace detail {

template <auto Member>
struct MemberTraits;
template <class R, class T, T R::*Member>
struct MemberTraits<Member> {
  using Record = R;
  using Type = T;
};

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
  return requires { R{AnythingAt<I>{}...}; };
}

template <class R>
struct Somewhere {
  static const R record;  // never defined: only the addresses of its members are compared
};

/// Members `A`, `B` are declared in this order. Only g++ can tell while compiling.
template <auto A, auto B>
constexpr bool declaredBefore() {
#ifdef __clang__
  return true;
#else
  using R = typename MemberTraits<A>::Record;
  const void* a = &(Somewhere<R>::record.*A);
  const void* b = &(Somewhere<R>::record.*B);
  return a < b;
#endif
}

template <auto... Members>
struct InOrder {
  static constexpr bool value = true;
};
template <auto First, auto Second, auto... Rest>
struct InOrder<First, Second, Rest...> {
  static constexpr bool value = declaredBefore<First, Second>() && InOrder<Second, Rest...>::value;
};

}  // namespace detail

/// One member of a record, as a type: what a walk over a record's fields is given.
template <auto Member>
struct Field {
  using Record = typename detail::MemberTraits<Member>::Record;
  using Type = typename detail::MemberTraits<Member>::Type;
  static constexpr std::string_view name = detail::lastIdentifier(detail::prettyName<Member>());

  static Type& in(Record& record) noexcept { return record.*Member; }
  static const Type& in(const Record& record) noexcept { return record.*Member; }
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
    static_assert(detail::InOrder<Members...>::value,
                  "the list does not name the members in the order of their declaration");
    return true;
  }
};

}  // namespace ironmoat
