#pragma once

#include <string>

#include "values/block_builder.h"

namespace ironmoat::testing {

/// What `write` appends to a builder.
template <class Write>
std::string written(const Write& write) {
  BlockBuilder builder;
  write(builder);
  return builder.size() == 0 ? "" : std::string(builder.bytes(), builder.size());
}

}  // namespace ironmoat::testing
