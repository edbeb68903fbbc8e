#include "sandbox/sandbox.h"

#include <fcntl.h>
#include <linux/capability.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <exception>
#include <string>

#include "ironmoat/limits.h"
#include "sandbox/seccomp_filter.h"

namespace ironmoat::sandbox {

namespace {

// Room for everything that the limits allow for one message, in buffers that double as they grow.
constexpr std::size_t kOneMessage =
    2 * (limits::messageBytes + limits::recordBytes + limits::deliveredBytes + limits::replyBytes);
constexpr std::size_t kRest = std::size_t{64} << 20;  // program, stack, fragmentation
static_assert(kOneMessage + kRest <= kAddressSpace);

// Since Linux 6.3; <sys/prctl.h> may be older.
constexpr int kSetDenyWriteExecute = 65;
constexpr int kGetDenyWriteExecute = 66;
constexpr unsigned long kRefuseExecGain = 1;  // NOLINT(google-runtime-int): as prctl takes it

/// Lowers a limit for good, to `max` or to an inherited lower limit.
bool limit(__rlimit_resource resource, rlim_t max) noexcept {
  rlimit value = {};
  if (::getrlimit(resource, &value) != 0) return false;
  value.rlim_max = std::min(value.rlim_max, max);
  value.rlim_cur = value.rlim_max;
  return ::setrlimit(resource, &value) == 0;
}

struct Limit {
  Part part;
  __rlimit_resource resource;
  rlim_t max;
};
constexpr std::array kZeroLimits = {
    Limit{Part::noCoreFile, RLIMIT_CORE, 0},
    Limit{Part::noFileGrowth, RLIMIT_FSIZE, 0},
    Limit{Part::noOpenFiles, RLIMIT_NOFILE, 0},
    Limit{Part::noProcesses, RLIMIT_NPROC, 0},
};

/// Makes the kernel kill this process when the reading end of its standard error is closed, as by
/// the end of the daemon. Unlike a parent-death signal this does not depend on the thread that
/// started the process, and needs no permission. Requires a pipe in packet mode, by which a client
/// marks a pipe that serves this purpose alone: a read from it kills the process, too.
bool endWithReaderOfStandardError() noexcept {
  struct stat what = {};
  const int flags = ::fcntl(STDERR_FILENO, F_GETFL);
  return flags >= 0 && (flags & O_DIRECT) != 0 && ::fstat(STDERR_FILENO, &what) == 0 &&
         S_ISFIFO(what.st_mode) && ::fcntl(STDERR_FILENO, F_SETSIG, SIGKILL) == 0 &&
         ::fcntl(STDERR_FILENO, F_SETOWN, ::getpid()) == 0 &&
         ::fcntl(STDERR_FILENO, F_SETFL, flags | O_ASYNC) == 0;
}

bool dropCapabilities() noexcept {
  __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};
  const __user_cap_data_struct none[_LINUX_CAPABILITY_U32S_3] = {};
  return ::syscall(SYS_capset, &header, none) == 0;
}

/// The first exception of a process initialises the unwinder by a futex call, which the filter does
/// not allow.
void throwOnce() noexcept {
  try {
    throw std::exception();
  } catch (const std::exception&) {
  }
}

class Parts {
 public:
  /// Calls `act`, which returns whether it succeeded, if this build requires the part.
  template <class Act>
  void require(Part part, Act act) {
    if (!isRequired(part)) return;
    if (!act()) throw Unavailable(part, errno);
    inForce(part);
  }
  void inForce(Part part) noexcept { bits_ |= static_cast<std::uint32_t>(part); }
  [[nodiscard]] std::uint32_t bits() const noexcept { return bits_; }

 private:
  std::uint32_t bits_ = 0;
};

}  // namespace

Unavailable::Unavailable(Part part, int error)
    : std::system_error(error, std::generic_category(),
                        "unavailable: " + std::string(lackToldBy(statusWithout(part))->name)),
      exitStatus_(statusWithout(part)) {}

std::uint32_t enter() {
  throwOnce();
  Parts parts;
  parts.require(Part::endsWithParent, [] {
    return endWithReaderOfStandardError() || ::prctl(PR_SET_PDEATHSIG, SIGKILL) == 0;
  });
  if (::setsid() >= 0 || ::getsid(0) == ::getpid()) parts.inForce(Part::ownSession);
  parts.require(Part::notDumpable, [] { return ::prctl(PR_SET_DUMPABLE, 0) == 0; });

  // A limit does not close descriptors that are open.
  if (!kSanitizedBuild) ::closefrom(STDERR_FILENO + 1);
  for (const Limit& zero : kZeroLimits) {
    parts.require(zero.part, [&] { return limit(zero.resource, zero.max); });
  }
  parts.require(Part::addressSpaceLimit, [] { return limit(RLIMIT_AS, kAddressSpace); });
  rlimit memory = {};
  if (::getrlimit(RLIMIT_AS, &memory) == 0 && memory.rlim_cur >= kAddressSpace) {
    parts.inForce(Part::fullMemory);
  }
  if (::prctl(PR_SET_SPECULATION_CTRL, PR_SPEC_STORE_BYPASS, PR_SPEC_FORCE_DISABLE, 0, 0) == 0) {
    parts.inForce(Part::noStoreBypass);
  }

  ::prctl(kSetDenyWriteExecute, kRefuseExecGain, 0, 0, 0);
  const int denied = ::prctl(kGetDenyWriteExecute, 0, 0, 0, 0);
  if (denied > 0 && (static_cast<unsigned>(denied) & kRefuseExecGain) != 0) {
    parts.inForce(Part::noNewCode);
  }
  parts.require(Part::noCapabilities, [] { return dropCapabilities(); });
  parts.require(Part::noNewPrivileges,
                [] { return ::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0; });
  parts.require(Part::systemCallFilter, [] { return filterSystemCalls(); });
  return parts.bits();
}

}  // namespace ironmoat::sandbox
