#pragma once

#include <concepts>
#include <type_traits>
#include <utility>

#include "ironmoat/api.h"
#include "ironmoat/fields.h"
#include "ironmoat/values.h"

namespace ironmoat {

/// Returns the arguments `A` when called.
template <class Make, class A>
concept MakerOf = std::same_as<std::invoke_result_t<Make&>, A>;

namespace detail {

/// Whether an initialiser has thrown on this thread. Set where initialisers are called, cleared and
/// asked in values/host_rejection.h: what an initialiser throws, no other code is to be blamed for.
inline constinit thread_local bool initialiserThrew = false;

}  // namespace detail

/// What every output record of the host is: the arguments of its initialiser, in label order (the
/// first one is labelled `with`, every other one with its field's name), once `admit` has let them
/// pass. A daemon reads the members of `A` and never makes one, but in its tests.
///
/// For each `A` there is a function `void admit(const A&)`, which throws what the host rejects.
template <class Self, class A>
struct OutputRecord : A {
  using Arguments = A;

  /// The initialiser. Throws what `admit` does.
  [[nodiscard]] static Self with(A arguments) {
    return Self([&] { return A(std::move(arguments)); });
  }

  /// The same in place: what `make` returns is not moved, which spares the largest record 2 KB.
  template <MakerOf<A> Make>
  explicit OutputRecord(Make&& make) : A(make()) {
    static_assert(A::Fields::check());
    try {
      admit(static_cast<const A&>(*this));
    } catch (...) {
      detail::initialiserThrew = true;
      throw;
    }
  }
};

}  // namespace ironmoat
