#pragma once

#include <cstdlib>

namespace ironmoat::fuzz {

/// Aborts if `holds` is false, so that libFuzzer reports the input.
inline void require(bool holds) {
  if (!holds) std::abort();
}

}  // namespace ironmoat::fuzz
