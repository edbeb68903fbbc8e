#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "ironmoat/errors.h"

namespace ironmoat::plist {

/// `reason`, then " at offset N": how every refusal of bytes reads.
DecodingError malformed(std::string_view reason, std::uint64_t offset);

/// Containers nested past limits::nestedContainers.
DecodingError tooDeep();

}  // namespace ironmoat::plist
