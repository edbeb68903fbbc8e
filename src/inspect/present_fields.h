#pragma once

#include <string_view>

#include "values/record_traits.h"

namespace ironmoat::inspect {

/// Calls `visit(name, value)` for each field that is present, in the order of the initialiser's
/// arguments. The name of the first field is its own, not its label `with`.
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
