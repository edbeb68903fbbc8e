#include "sandbox_parts/sandbox_parts.h"

#include <algorithm>
#include <iterator>

namespace ironmoat::sandbox {

const PartDescription* lackToldBy(int exitStatus) noexcept {
  const auto* const found = std::find_if(
      std::begin(kParts), std::end(kParts),
      [=](const PartDescription& known) { return statusWithout(known.part) == exitStatus; });
  return found == std::end(kParts) ? nullptr : found;
}

}  // namespace ironmoat::sandbox
