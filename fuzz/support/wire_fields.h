#pragma once

#include <type_traits>

#include "records/keyed_record.h"
#include "support/generated_records.h"

namespace ironmoat {

/// Where the fields of a wire record are.
template <class R>
requires requires { typename R::CodingKeys; }
struct testing::FieldsOf<R> {
  using List = typename std::remove_const_t<decltype(records::Table<R>::rows)>::template Fields<R>;
};

}  // namespace ironmoat
