#include "client/greeting.h"

#include <string>

#include "frames/confinement_bits.h"

namespace ironmoat::client {

void requireUsable(const frames::Hello& hello) {
  frames::Hello expected = frames::Hello::ours();
  expected.confinement = hello.confinement;
  if (hello != expected) throw frames::FrameError("its limits differ from this library's");
  for (const auto& [part, name, required] : frames::kConfinementNames) {
    const auto bit = static_cast<std::uint32_t>(part);
    if ((frames::kRequiredConfinement & bit) != 0 && (hello.confinement & bit) == 0) {
      throw frames::FrameError("its sandbox lacks: " + std::string(name));
    }
  }
}

bool hasLimitedMemory(const frames::Hello& hello) noexcept {
  return (hello.confinement & static_cast<std::uint32_t>(frames::Confinement::fullMemory)) == 0;
}

}  // namespace ironmoat::client
