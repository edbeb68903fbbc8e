#pragma once

#include <string>

#include "ironmoat/errors.h"

namespace ironmoat::testing {

/// A refusal as "kind path: sentence" ("kind: sentence" without a path).
inline std::string inWords(const DecodingError& refusal) {
  std::string text(nameOf(refusal.kind()));
  if (!refusal.path().empty()) text.append(" ").append(refusal.path());
  return text.append(": ").append(refusal.what());
}

}  // namespace ironmoat::testing
