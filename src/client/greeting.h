#pragma once

#include <string>

#include "frames/frame.h"

namespace ironmoat::client {

/// Why a service that greets so is not to be used, by its limits or by a part of its confinement
/// that is missing; empty when it may be.
std::string objectionTo(const frames::Hello& hello);

}  // namespace ironmoat::client
