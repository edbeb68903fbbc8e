#pragma once

#include <string>

#include "ironmoat/errors.h"

namespace ironmoat::testing {

/// A rejection as "kind path: description" ("kind: description" without a path).
inline std::string inWords(const DecodingError& rejection) {
  std::string text(nameOf(rejection.kind()));
  if (!rejection.path().empty()) text.append(" ").append(rejection.path());
  return text.append(": ").append(rejection.what());
}

}  // namespace ironmoat::testing
