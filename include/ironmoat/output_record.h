#pragma once

#include <concepts>
#include <type_traits>

#include "ironmoat/fields.h"
#include "ironmoat/values.h"

/// The host's output records. Each is two structs: the arguments of its initialiser in label order
/// (the first one is labelled `with`, every other one with its field's name), and the record, which
/// is those arguments once `admit` has let them pass. `with` makes one out of arguments; the
/// constructor makes one in place, without moving what `make` returns.
namespace ironmoat {

/// Returns the arguments `A` when called.
template <class Make, class A>
concept MakerOf = std::same_as<std::invoke_result_t<Make&>, A>;

}  // namespace ironmoat
