// The confinement tried from inside: children that confine themselves and then do one thing. (S12)

#include "confinement/confinement.h"

#include <alloca.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <functional>
#include <iterator>
#include <map>
#include <ostream>
#include <string>

#include "confinement/memory.h"

namespace ironmoat::confinement {
namespace {

using Arguments = std::array<long, 6>;

/// How a child ended that ran `act`: "returned", an error's name as in "ENOENT", or a signal's.
/// `act` returns what a system call does. What it writes to standard error goes to `words`.
std::string outcomeOf(const std::function<long()>& act, int words = open("/dev/null", O_WRONLY)) {
  const pid_t child = fork();
  if (child == 0) {
    alarm(10);
    dup2(words, STDERR_FILENO);
    const long result = act();
    syscall(SYS_exit_group, result < 0 ? errno : 0);
  }
  close(words);
  int status = 0;
  if (waitpid(child, &status, 0) != child) return "lost";
  if (WIFSIGNALED(status)) return std::string("SIG") + sigabbrev_np(WTERMSIG(status));
  return WEXITSTATUS(status) == 0 ? "returned" : strerrorname_np(WEXITSTATUS(status));
}

std::string confinedOutcomeOf(const std::function<long()>& act) {
  return outcomeOf([&] {
    confine();
    return act();
  });
}

std::string confinedCall(long number, const Arguments& a) {
  return confinedOutcomeOf([&] { return syscall(number, a[0], a[1], a[2], a[3], a[4], a[5]); });
}

class ConfinementTest : public ::testing::Test {
 protected:
  void SetUp() override {
    if (confinement::kSanitizedBuild) {
      GTEST_SKIP() << "built with a sanitizer, which needs what the confinement takes";
    }
    std::fflush(nullptr);
  }
};

constexpr long kReadWrite = PROT_READ | PROT_WRITE;
constexpr long kPrivate = MAP_PRIVATE | MAP_ANONYMOUS;

/// The calls that survive, with arguments that do.
const std::map<long, Arguments>& listed() {
  static const timespec noTime = {};
  static const std::map<long, Arguments> calls = {
      {SYS_read, {0, 0, 0}},
      {SYS_write, {2, 0, 0}},
      {SYS_writev, {1, 0, 0}},
      {SYS_pselect6, {2, 0, 0, 0, reinterpret_cast<long>(&noTime), 0}},
      {SYS_openat, {AT_FDCWD, reinterpret_cast<long>("/"), 0}},
      {SYS_brk, {0}},
      {SYS_mmap, {0, 4096, kReadWrite, kPrivate, -1, 0}},
      {SYS_mremap, {0, 4096, 8192, MREMAP_MAYMOVE}},
      {SYS_munmap, {0, 4096}},
      {SYS_madvise, {0, 0, MADV_DONTNEED}},
      {SYS_clock_gettime, {CLOCK_MONOTONIC, 0}},
      {SYS_restart_syscall, {}},
      {SYS_exit_group, {}},
      {SYS_rt_sigprocmask, {SIG_BLOCK, 0, 0, 8}},
      {SYS_getpid, {}},
      {SYS_gettid, {}},
      {SYS_tgkill, {0, 0, SIGABRT}},  // itself, put in below
  };
  return calls;
}

/// Calls of the kernel's own making for a traced program. Newer kernels ask no filter about them;
/// made from anywhere but the kernel's page for it, one fails and the other is an illegal
/// instruction.
constexpr long kUretprobe = 335;
constexpr long kUprobe = 336;

TEST_F(ConfinementTest, OnlyListedSystemCallsSurvive) {
  for (long number = 0; number < 512; ++number) {
    const auto found = listed().find(number);
    if (number == kUretprobe || number == kUprobe) {
      EXPECT_NE(confinedCall(number, {}), "returned");
    } else if (found == listed().end()) {
      EXPECT_EQ(confinedCall(number, {}), "SIGSYS") << "system call " << number;
    } else if (number != SYS_tgkill) {
      EXPECT_NE(confinedCall(number, found->second), "SIGSYS") << "system call " << number;
    }
  }
}

struct Try {
  const char* what;
  long number;
  Arguments arguments;
  const char* outcome;
};
std::ostream& operator<<(std::ostream& out, const Try& tried) { return out << tried.what; }

TEST_F(ConfinementTest, ArgumentsAreLimited) {
  const long executable = reinterpret_cast<long>(&outcomeOf) & -4096L;
  const long shared = MAP_SHARED | MAP_ANONYMOUS;
  const timespec noTime = {};
  const long time = reinterpret_cast<long>(&noTime);
  const Try tries[] = {
      {"read of another descriptor", SYS_read, {1, 0, 0}, "SIGSYS"},
      {"write to the replies", SYS_write, {1, 0, 0}, "SIGSYS"},
      {"write to the requests", SYS_write, {0, 0, 0}, "SIGSYS"},
      {"last words", SYS_writev, {2, 0, 0}, "returned"},
      {"writev to another descriptor", SYS_writev, {3, 0, 0}, "SIGSYS"},
      {"waiting for other descriptors", SYS_pselect6, {4, 0, 0, 0, time, 0}, "SIGSYS"},
      {"an existing file", SYS_openat, {AT_FDCWD, reinterpret_cast<long>("/")}, "ENOENT"},
      {"a new file", SYS_openat, {-1, reinterpret_cast<long>("/tmp/x"), 0102, 0600}, "ENOENT"},

      {"memory", SYS_mmap, {0, 4096, kReadWrite, kPrivate, -1}, "returned"},
      {"memory not to be used", SYS_mmap, {0, 4096, PROT_NONE, kPrivate, -1}, "returned"},
      {"memory to execute", SYS_mmap, {0, 4096, PROT_READ | PROT_EXEC, kPrivate, -1}, "SIGSYS"},
      {"all rights", SYS_mmap, {0, 4096, kReadWrite | PROT_EXEC, kPrivate, -1}, "SIGSYS"},
      {"high bits", SYS_mmap, {0, 4096, kReadWrite | (1L << 32), kPrivate, -1}, "SIGSYS"},
      {"shared memory", SYS_mmap, {0, 4096, kReadWrite, shared, -1}, "SIGSYS"},
      {"fixed memory",
       SYS_mmap,
       {executable, 4096, kReadWrite, kPrivate | MAP_FIXED, -1},
       "SIGSYS"},
      {"a mapped file", SYS_mmap, {0, 4096, PROT_READ, MAP_PRIVATE, 0}, "SIGSYS"},
      {"a descriptor, anonymous", SYS_mmap, {0, 4096, PROT_READ, kPrivate, 0}, "SIGSYS"},
      {"code made writable", SYS_mprotect, {executable, 4096, kReadWrite}, "SIGSYS"},
      {"code moved", SYS_mremap, {executable, 4096, 4096, 3, 1L << 32}, "SIGSYS"},
      {"code given back", SYS_madvise, {executable, 4096, MADV_REMOVE}, "SIGSYS"},

      {"tgkill of init", SYS_tgkill, {1, 1, SIGABRT}, "SIGSYS"},
      {"tgkill of the parent", SYS_tgkill, {getpid(), getpid(), SIGABRT}, "SIGSYS"},
      {"a dynamic clock", SYS_clock_gettime, {-6, 0}, "SIGSYS"},
      {"a call of the x32 kind", 0x40000000 | SYS_getpid, {}, "SIGSYS"},
  };
  for (const Try& tried : tries) {
    EXPECT_EQ(confinedCall(tried.number, tried.arguments), tried.outcome) << tried;
  }
  for (int signal = 1; signal < 65; ++signal) {
    const std::string outcome = confinedOutcomeOf(
        [&] { return syscall(SYS_tgkill, getpid(), gettid(), static_cast<long>(signal)); });
    EXPECT_EQ(outcome, signal == SIGABRT ? "SIGABRT" : "SIGSYS") << "tgkill with " << signal;
  }
}

#ifdef __x86_64__
TEST_F(ConfinementTest, CallsByTheOldGateAreFiltered) {
  const auto getpidByTheOldGate = [] {
    long result = 20;
    asm volatile("int $0x80" : "+a"(result) : : "memory");
    return result;
  };
  if (outcomeOf(getpidByTheOldGate) == "SIGSEGV") GTEST_SKIP() << "this kernel has no such gate";
  EXPECT_EQ(confinedOutcomeOf(getpidByTheOldGate), "SIGSYS");
}
#endif

TEST_F(ConfinementTest, TheLastWordNamesAForbiddenCall) {
  int ends[2];
  ASSERT_EQ(pipe(ends), 0);
  const auto act = [] {
    sigset_t all;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, nullptr);
    confine();
    return syscall(SYS_socket, 1, 1, 0);
  };
  EXPECT_EQ(outcomeOf(act), "SIGSYS") << "all signals blocked";
  const auto socket = [] {
    confine();
    return syscall(SYS_socket, 1, 1, 0);
  };
  EXPECT_EQ(outcomeOf(socket, ends[1]), "SIGSYS");
  char words[100] = {};
  EXPECT_GT(read(ends[0], words, sizeof words - 1), 0);
  EXPECT_EQ(words, "forbidden system call " + std::to_string(SYS_socket) + " (socket)\n");
  close(ends[0]);
  EXPECT_EQ(outcomeOf(socket, open("/tmp", O_TMPFILE | O_WRONLY, 0600)), "SIGSYS") << "to a file";
}

TEST_F(ConfinementTest, DescriptorsThatWereOpenAreClosed) {
  int ends[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
  const pid_t child = fork();
  if (child == 0) {
    confine();
    syscall(SYS_read, STDIN_FILENO, nullptr, 0);
    for (volatile bool forever = true; forever;) {
    }
  }
  close(ends[1]);
  char byte = 0;
  EXPECT_EQ(read(ends[0], &byte, 1), 0) << "the child still holds the other end";
  close(ends[0]);
  kill(child, SIGKILL);
  waitpid(child, nullptr, 0);
}

/// What a client's death, or its closing of the pipe, does to a service that hears nothing.
TEST_F(ConfinementTest, EndsWithTheReaderOfAPipeInPacketMode) {
  for (const int mode : {O_DIRECT, 0}) {
    int ends[2];
    ASSERT_EQ(pipe2(ends, mode), 0);
    const pid_t child = fork();
    if (child == 0) {
      alarm(10);
      close(ends[0]);
      dup2(ends[1], STDERR_FILENO);
      signal(SIGPIPE, SIG_IGN);
      confine();
      for (volatile bool forever = true; forever;) {
      }
    }
    close(ends[1]);
    usleep(100'000);
    close(ends[0]);
    usleep(100'000);
    int status = 0;
    const bool ended = waitpid(child, &status, WNOHANG) == child;
    EXPECT_EQ(ended, mode != 0) << "any other pipe may be other processes' as well";
    if (ended) {
      EXPECT_EQ(WTERMSIG(status), SIGKILL);
    } else {
      kill(child, SIGKILL);
      waitpid(child, nullptr, 0);
    }
  }
}

TEST_F(ConfinementTest, DropsCapabilities) {
  if (geteuid() != 0) GTEST_SKIP() << "needs capabilities to drop";
  const pid_t child = fork();
  if (child == 0) {
    alarm(10);
    confine();
    for (volatile bool forever = true; forever;) {
    }
  }
  usleep(100'000);
  std::ifstream status("/proc/" + std::to_string(child) + "/status");
  const std::string all(std::istreambuf_iterator<char>(status), {});
  for (const char* set : {"CapPrm:", "CapEff:", "CapInh:", "CapAmb:"}) {
    EXPECT_NE(all.find(set + std::string("\t0000000000000000\n")), std::string::npos) << all;
  }
  kill(child, SIGKILL);
  waitpid(child, nullptr, 0);
}

/// The pages that are released end below the frames in use, wherever in a page those lie.
TEST(WipeMemory, LeavesTheStackInUse) {
  for (std::size_t offset = 0; offset < 4096; offset += 16) {
    EXPECT_EQ(outcomeOf([&] {
                prepareMemory();
                auto* const moved = static_cast<volatile char*>(alloca(offset + 16));
                moved[0] = 0;
                wipeAndReleaseMemory();
                return long{moved[0]};
              }),
              "returned")
        << offset;
  }
}

}  // namespace
}  // namespace ironmoat::confinement
