#include "confinement_parts/confinement_parts.h"

#include <algorithm>
#include <iterator>

namespace ironmoat::confinement {

const PartDescription* lackToldBy(int exitStatus) noexcept {
  const auto* const found = std::find_if(
      std::begin(kParts), std::end(kParts),
      [=](const PartDescription& known) { return statusWithout(known.part) == exitStatus; });
  return found == std::end(kParts) ? nullptr : found;
}

}  // namespace ironmoat::confinement
