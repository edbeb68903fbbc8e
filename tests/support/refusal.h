#pragma once

#include <string>

#include "ironmoat/errors.h"

namespace ironmoat::testing {

/// What `act` is refused with, as "kind path: sentence" ("kind: sentence" without a path), or
/// "accepted".
template <class Act>
std::string refusalOf(Act&& act) {
  try {
    act();
  } catch (const DecodingError& error) {
    std::string text(nameOf(error.kind()));
    if (!error.path().empty()) text.append(" ").append(error.path());
    return text.append(": ").append(error.what());
  }
  return "accepted";
}

}  // namespace ironmoat::testing
