#pragma once

#include <array>
#include <bit>
#include <cstdint>
#include <string_view>

namespace ironmoat::frames {

/// What confines a service, on every one of its threads; the bits of Hello::confinement.
enum class Confinement : std::uint32_t {
  systemCallFilter = 1U << 0U,   ///< any call that is not listed kills the process
  noNewPrivileges = 1U << 1U,    ///< running a set-user-ID program gives nothing
  notDumpable = 1U << 2U,        ///< not to be traced by its user's other processes
  noCoreFile = 1U << 3U,         ///< core size limit 0: no message is left on disk
  noFileGrowth = 1U << 4U,       ///< file size limit 0
  noOpenFiles = 1U << 5U,        ///< the standard three descriptors and, limit 0, no other
  noProcesses = 1U << 6U,        ///< process limit 0, threads included
  addressSpaceLimit = 1U << 7U,  ///< of confinement/confinement.h or an inherited lower one
  noNewCode = 1U << 8U,          ///< memory once writable never becomes executable; Linux 6.3
  endsWithParent = 1U << 9U,     ///< killed when the process that started it ends
  noCapabilities = 1U << 10U,    ///< none of root's privileges, also when started by root
  ownSession = 1U << 11U,        ///< no signal from a terminal or a process group reaches it
  noStoreBypass = 1U << 12U,     ///< speculative store bypass is off, where processors have it
  fullMemory = 1U << 13U,        ///< the address space limit is not a lower one that was inherited
};

struct ConfinementName {
  Confinement part;
  std::string_view name;
  bool required = true;  ///< where it is not to be had, the service does not serve
};
inline constexpr std::array kConfinementNames = {
    ConfinementName{Confinement::systemCallFilter, "system call filter"},
    ConfinementName{Confinement::noNewPrivileges, "no new privileges"},
    ConfinementName{Confinement::notDumpable, "not dumpable"},
    ConfinementName{Confinement::noCoreFile, "no core file"},
    ConfinementName{Confinement::noFileGrowth, "no file growth"},
    ConfinementName{Confinement::noOpenFiles, "no open files"},
    ConfinementName{Confinement::noProcesses, "no processes"},
    ConfinementName{Confinement::addressSpaceLimit, "address space limit"},
    ConfinementName{Confinement::noNewCode, "no new code", false},
    ConfinementName{Confinement::endsWithParent, "ends with parent"},
    ConfinementName{Confinement::noCapabilities, "no capabilities"},
    ConfinementName{Confinement::ownSession, "own session", false},
    ConfinementName{Confinement::noStoreBypass, "no store bypass", false},
    ConfinementName{Confinement::fullMemory, "full memory", false},
};

/// A service that cannot have a part exits with this plus the number of its bit.
inline constexpr int kCannotConfineStatus = 64;

/// The part whose lack an exit status tells of, if it does.
[[nodiscard]] constexpr const ConfinementName* lackToldBy(int exitStatus) noexcept {
  for (const ConfinementName& known : kConfinementNames) {
    const int bit = std::countr_zero(static_cast<std::uint32_t>(known.part));
    if (exitStatus == kCannotConfineStatus + bit) return &known;
  }
  return nullptr;
}

/// Sanitizers map terabytes, open files and start a process to report what they find: their builds
/// go without what forbids that, on both ends of the line.
#ifdef IRONMOAT_SANITIZED
inline constexpr bool kSanitizedBuild = true;
#else
inline constexpr bool kSanitizedBuild = false;
#endif

[[nodiscard]] constexpr bool standsSanitizers(Confinement part) noexcept {
  return part == Confinement::noNewPrivileges || part == Confinement::noCoreFile ||
         part == Confinement::noNewCode || part == Confinement::endsWithParent;
}

/// What a service of this build has in force whatever the kernel, or else does not serve.
inline constexpr std::uint32_t kRequiredConfinement = [] {
  std::uint32_t bits = 0;
  for (const ConfinementName& known : kConfinementNames) {
    if (known.required && (!kSanitizedBuild || standsSanitizers(known.part))) {
      bits |= static_cast<std::uint32_t>(known.part);
    }
  }
  return bits;
}();

}  // namespace ironmoat::frames
