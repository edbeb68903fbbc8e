#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "ironmoat/errors.h"

namespace ironmoat::plist {

/// A `malformed` whose description is `reason` and " at offset N".
DecodingError malformed(std::string_view reason, std::uint64_t offset);

/// For containers nested deeper than limits::nestedContainers.
DecodingError tooDeep();

}  // namespace ironmoat::plist
