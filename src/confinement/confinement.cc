#include "confinement/confinement.h"

#include <malloc.h>
#include <pthread.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <bit>
#include <cerrno>
#include <csignal>
#include <string>

#include "confinement/seccomp_filter.h"
#include "ironmoat/limits.h"

namespace ironmoat::confinement {

using frames::Confinement;

namespace {

constexpr std::size_t kStack = std::size_t{8} << 20;  // of a thread

// Measured with two threads, the worst messages known (64 MiB of records, 64 MiB of data, the rest
// of 16 MiB to be skipped) take the process to 256 MiB, two at once to 520; so about four fit, and
// more take turns. A message that is tried alone has room for all that its limits allow, in buffers
// that double as they grow, beside those that wait.
constexpr std::size_t kOneMessage =
    2 * (limits::messageBytes + limits::recordBytes + limits::deliveredBytes + limits::replyBytes);
constexpr std::size_t kWaiting = (std::size_t{kMostThreads} - 1) * 2 * limits::messageBytes;
constexpr std::size_t kRest = std::size_t{64} << 20;  // programs, free memory in pieces
static_assert(kOneMessage + kWaiting + kMostThreads * kStack + kRest <= kAddressSpace);

// Linux 6.3; <sys/prctl.h> may be older.
constexpr int kSetDenyWriteExecute = 65;
constexpr int kGetDenyWriteExecute = 66;
constexpr unsigned long kRefuseExecGain = 1;  // NOLINT(google-runtime-int): as prctl takes it

std::string nameOf(Confinement part) {
  const auto* const known =
      std::find_if(frames::kConfinementNames.begin(), frames::kConfinementNames.end(),
                   [part](const auto& named) { return named.part == part; });
  return std::string(known->name);
}

/// Lowers a limit for good, never above what was given.
bool limit(__rlimit_resource resource, rlim_t most) noexcept {
  rlimit value = {};
  if (::getrlimit(resource, &value) != 0) return false;
  value.rlim_max = std::min(value.rlim_max, most);
  value.rlim_cur = value.rlim_max;
  return ::setrlimit(resource, &value) == 0;
}

struct Limit {
  Confinement part;
  __rlimit_resource resource;
  rlim_t most;
};
constexpr std::array kZeroLimits = {
    Limit{Confinement::noCoreFile, RLIMIT_CORE, 0},
    Limit{Confinement::noFileGrowth, RLIMIT_FSIZE, 0},
    Limit{Confinement::noOpenFiles, RLIMIT_NOFILE, 0},
    Limit{Confinement::noProcesses, RLIMIT_NPROC, 0},
};

class Parts {
 public:
  /// Does `act`, which returns whether it worked, unless a sanitizer is in the way.
  template <class Act>
  void require(Confinement part, Act act) {
    if (frames::kSanitizedBuild && !frames::standsSanitizers(part)) return;
    if (!act()) throw CannotConfine(part, errno);
    inForce(part);
  }
  void inForce(Confinement part) noexcept { bits_ |= static_cast<std::uint32_t>(part); }
  [[nodiscard]] std::uint32_t bits() const noexcept { return bits_; }

 private:
  std::uint32_t bits_ = 0;
};

}  // namespace

CannotConfine::CannotConfine(Confinement part, int error)
    : std::system_error(error, std::generic_category(), "cannot have: " + nameOf(part)),
      part_(part) {}

int CannotConfine::exitStatus() const noexcept {
  return frames::kCannotConfineStatus + std::countr_zero(static_cast<std::uint32_t>(part_));
}

void prepareMemory() noexcept {
  // More arenas would make a thread that finds one busy map another, ask /sys for the number of
  // processors and call mprotect as it grows, which is forbidden; and each one hoards memory of
  // its own under the one limit.
  ::mallopt(M_ARENA_MAX, 1);
  // Setting either ends glibc's own adjusting of both. By default the lists of one message go back
  // to the kernel when it is done, and their pages are faulted in and zeroed again for the next:
  // 3-5 times the time of a message of many records. The first is the highest that glibc takes.
  ::mallopt(M_MMAP_THRESHOLD, 32 << 20);
  ::mallopt(M_TRIM_THRESHOLD, 128 << 20);
  // Not what the daemon's own limit happens to be: a message of the deepest nesting takes under
  // 1 MiB, several times that with a sanitizer.
  pthread_attr_t attributes;
  if (::pthread_attr_init(&attributes) == 0) {
    ::pthread_attr_setstacksize(&attributes, kStack);
    ::pthread_setattr_default_np(&attributes);
    ::pthread_attr_destroy(&attributes);
  }
}

void giveBackMemory() noexcept { ::malloc_trim(0); }

std::uint32_t confine() {
  Parts parts;
  // The client's thread that starts the service outlives it, unless its whole process dies: then
  // this does not depend on our noticing the end of input. Who starts a service from a thread of
  // its own gets what he asked for. A parent that is gone by now is noticed by the end of input.
  parts.require(Confinement::endsWithParent,
                [] { return ::prctl(PR_SET_PDEATHSIG, SIGKILL) == 0; });
  parts.require(Confinement::notDumpable, [] { return ::prctl(PR_SET_DUMPABLE, 0) == 0; });

  // A limit does not touch what is open already.
  if (!frames::kSanitizedBuild) ::closefrom(STDERR_FILENO + 1);
  for (const Limit& zero : kZeroLimits) {
    parts.require(zero.part, [&] { return limit(zero.resource, zero.most); });
  }
  parts.require(Confinement::addressSpaceLimit, [] { return limit(RLIMIT_AS, kAddressSpace); });

  ::prctl(kSetDenyWriteExecute, kRefuseExecGain, 0, 0, 0);
  const int denied = ::prctl(kGetDenyWriteExecute, 0, 0, 0, 0);
  if (denied > 0 && (static_cast<unsigned>(denied) & kRefuseExecGain) != 0) {
    parts.inForce(Confinement::noNewCode);
  }
  parts.require(Confinement::noNewPrivileges,
                [] { return ::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0; });
  parts.require(Confinement::systemCallFilter, [] { return filterSystemCalls(); });
  return parts.bits();
}

}  // namespace ironmoat::confinement
