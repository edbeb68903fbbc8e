#pragma once

#include <bit>
#include <concepts>
#include <cstring>

namespace ironmoat::frames {

static_assert(std::endian::native == std::endian::little, "numbers cross the line as they lie");

/// The number at `from`, which has sizeof(T) bytes behind it; no alignment needed.
template <std::integral T>
T load(const char* from) noexcept {
  T value;
  std::memcpy(&value, from, sizeof value);
  return value;
}

/// Writes `value` to `to`; returns what follows it.
template <std::integral T>
char* store(char* to, T value) noexcept {
  std::memcpy(to, &value, sizeof value);
  return to + sizeof value;
}

}  // namespace ironmoat::frames
