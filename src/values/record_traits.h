#pragma once

#include "ironmoat/values.h"

/// What generic code asks of the type of a field.
namespace ironmoat {

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

}  // namespace ironmoat
