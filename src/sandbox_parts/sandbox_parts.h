#pragma once

#include <bit>
#include <cstdint>
#include <string_view>

/// What a sandboxed service tells about its sandbox, and what a client requires of it. Apart from
/// the sandbox itself, which no client may contain.
namespace ironmoat::sandbox {

/// A restriction on every thread of a service. The value is its bit in a hello.
enum class Part : std::uint32_t {
  systemCallFilter = 1U << 0U,   ///< any call that is not listed kills the process
  noNewPrivileges = 1U << 1U,    ///< running a set-user-ID program gives nothing
  notDumpable = 1U << 2U,        ///< other processes of its user cannot trace it
  noCoreFile = 1U << 3U,         ///< core size limit 0: no message is left on disk
  noFileGrowth = 1U << 4U,       ///< file size limit 0
  noOpenFiles = 1U << 5U,        ///< the standard three descriptors and, limit 0, no other
  noProcesses = 1U << 6U,        ///< process limit 0, threads included
  addressSpaceLimit = 1U << 7U,  ///< of sandbox/sandbox.h, or an inherited lower one
  noNewCode = 1U << 8U,          ///< memory once writable never becomes executable; Linux 6.3
  endsWithParent = 1U << 9U,     ///< killed when the process that started it ends
  noCapabilities = 1U << 10U,    ///< none of root's privileges, also when started by root
  ownSession = 1U << 11U,        ///< no signal of a terminal or a process group reaches it
  noStoreBypass = 1U << 12U,     ///< speculative store bypass is off, where processors have it
  fullMemory = 1U << 13U,        ///< the address space limit is not a lower one that was inherited
};

enum class Need : std::uint8_t {
  always,
  unlessSanitized,  ///< forbids what a sanitizer needs to report: memory, files, a process
  never,            ///< reported only
};

struct PartDescription {
  Part part;
  std::string_view name;
  Need need = Need::unlessSanitized;
};
/// In the order of their bits.
inline constexpr PartDescription kParts[] = {
    {Part::systemCallFilter, "system call filter"},
    {Part::noNewPrivileges, "no new privileges", Need::always},
    {Part::notDumpable, "not dumpable"},
    {Part::noCoreFile, "no core file", Need::always},
    {Part::noFileGrowth, "no file growth"},
    {Part::noOpenFiles, "no open files"},
    {Part::noProcesses, "no processes"},
    {Part::addressSpaceLimit, "address space limit"},
    {Part::noNewCode, "no new code", Need::never},
    {Part::endsWithParent, "ends with parent", Need::always},
    {Part::noCapabilities, "no capabilities"},
    {Part::ownSession, "own session", Need::never},
    {Part::noStoreBypass, "no store bypass", Need::never},
    {Part::fullMemory, "full memory", Need::never},
};

/// A service without a part that it requires exits with this plus the number of the part's bit.
inline constexpr int kFirstLackStatus = 64;

[[nodiscard]] constexpr int statusWithout(Part part) noexcept {
  return kFirstLackStatus + std::countr_zero(static_cast<std::uint32_t>(part));
}

/// The part whose lack an exit status reports, or null.
[[nodiscard]] const PartDescription* lackToldBy(int exitStatus) noexcept;

#ifdef IRONMOAT_SANITIZED
inline constexpr bool kSanitizedBuild = true;
#else
inline constexpr bool kSanitizedBuild = false;
#endif

/// The bits that every service of this build has, and every client of this build requires.
inline constexpr std::uint32_t kRequiredParts = [] {
  std::uint32_t bits = 0;
  for (const PartDescription& known : kParts) {
    const bool required =
        known.need == Need::always || (known.need == Need::unlessSanitized && !kSanitizedBuild);
    if (required) bits |= static_cast<std::uint32_t>(known.part);
  }
  return bits;
}();

[[nodiscard]] constexpr bool isRequired(Part part) noexcept {
  return (kRequiredParts & static_cast<std::uint32_t>(part)) != 0;
}

}  // namespace ironmoat::sandbox
