#pragma once

#include <string_view>

#include "ironmoat/values.h"

namespace ironmoat::inspect {

template <class T>
concept Record = requires {
  typename T::Arguments::Fields;
};

template <class T>
inline constexpr bool kIsOptional = false;
template <class T>
inline constexpr bool kIsOptional<Optional<T>> = true;

template <class T>
inline constexpr bool kIsList = false;
template <class T>
inline constexpr bool kIsList<List<T>> = true;

/// Calls `visit(name, value)` for each field that is present, in the order of the initialiser's
/// arguments. The first field, whose label is `with`, goes by its own name like the others.
template <Record R, class Visit>
void forEachPresentField(const R& record, const Visit& visit) {
  R::Arguments::Fields::forEach([&](auto field) {
    using F = decltype(field);
    const auto& value = F::in(record);
    if constexpr (kIsOptional<typename F::Type>) {
      if (value.has_value()) visit(F::name, *value);
    } else {
      visit(F::name, value);
    }
  });
}

}  // namespace ironmoat::inspect
