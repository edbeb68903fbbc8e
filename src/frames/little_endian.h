#pragma once

#include <bit>
#include <concepts>
#include <cstring>
#include <type_traits>

namespace ironmoat::frames {

static_assert(std::endian::native == std::endian::little, "numbers are copied as they are");

/// The number in the sizeof(T) bytes at `from`, which need no alignment.
template <std::integral T>
T load(const char* from) noexcept {
  T value;
  std::memcpy(&value, from, sizeof value);
  return value;
}

/// A number, or an enumerator of its size.
template <class T>
concept Fixed = std::integral<T> || std::is_enum_v<T>;

/// Writes `value` to `to`; returns the position after it.
template <Fixed T>
char* store(char* to, T value) noexcept {
  std::memcpy(to, &value, sizeof value);
  return to + sizeof value;
}

}  // namespace ironmoat::frames
