#include "client/greeting.h"

#include "frames/confinement_bits.h"

namespace ironmoat::client {

std::string objectionTo(const frames::Hello& hello) {
  frames::Hello expected = frames::Hello::ours();
  expected.confinement = hello.confinement;
  if (hello != expected) return "its limits are not those of this library";
  for (const auto& [part, name] : frames::kConfinementNames) {
    const auto bit = static_cast<std::uint32_t>(part);
    if ((frames::kRequiredConfinement & bit) != 0 && (hello.confinement & bit) == 0) {
      return "it is not confined: " + std::string(name);
    }
  }
  return {};
}

}  // namespace ironmoat::client
