#pragma once

#include <cstdlib>

namespace ironmoat::fuzz {

/// What always holds; libFuzzer shows where it did not.
inline void require(bool holds) {
  if (!holds) std::abort();
}

}  // namespace ironmoat::fuzz
