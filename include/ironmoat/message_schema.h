#pragma once

#include <concepts>
#include <string_view>
#include <type_traits>
#include <utility>

namespace ironmoat {

/// A top-level output record: what a request names and a reply carries.
///
/// `schemaName` names it on the wire, `Arguments` is the aggregate of its initialiser's arguments
/// in label order (`Arguments::Fields` lists them), and `with` is that throwing initialiser.
template <class R>
concept MessageSchema = requires(typename R::Arguments arguments) {
  { R::schemaName } -> std::convertible_to<std::string_view>;
  { R::with(std::move(arguments)) } -> std::same_as<R>;
  typename R::Arguments::Fields;
}
&&std::is_base_of_v<typename R::Arguments, R>;

}  // namespace ironmoat
