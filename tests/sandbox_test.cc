// The sandbox from inside: children that sandbox themselves and then do one thing. (S12)

#include "sandbox/sandbox.h"

#include <alloca.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
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
#include <functional>
#include <set>
#include <string>

#include "sandbox/memory.h"

namespace ironmoat::sandbox {
namespace {

using Arguments = std::array<long, 6>;
struct Call {
  long number;
  Arguments arguments = {};
};

/// How a child ends that runs `act`, which returns what a system call does: "returned", an error's
/// name such as "ENOENT", or a signal's. `words` becomes its standard error.
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

std::string sandboxedOutcomeOf(const std::function<long()>& act) {
  return outcomeOf([&] { return enter(), act(); });
}
std::string sandboxedOutcomeOf(const Call& call) {
  const Arguments& a = call.arguments;
  return sandboxedOutcomeOf(
      [&] { return syscall(call.number, a[0], a[1], a[2], a[3], a[4], a[5]); });
}

class SandboxTest : public ::testing::Test {
 protected:
  void SetUp() override {
    if (kSanitizedBuild) GTEST_SKIP() << "a sanitizer needs what the sandbox forbids";
    std::fflush(nullptr);
  }
};

TEST_F(SandboxTest, AllowsListedCallsWithListedArgumentsOnly) {
  constexpr long kReadWrite = PROT_READ | PROT_WRITE;
  constexpr long kPrivate = MAP_PRIVATE | MAP_ANONYMOUS;
  const auto path = reinterpret_cast<long>("/tmp/new");
  const long code = reinterpret_cast<long>(&strerrorname_np) & -4096L;
  const timespec noTime = {};
  const Call allowed[] = {{SYS_read},
                          {SYS_write, {2}},
                          {SYS_writev, {1}},
                          {SYS_writev, {2}},
                          {SYS_pselect6, {2, 0, 0, 0, reinterpret_cast<long>(&noTime)}},
                          {SYS_mmap, {0, 4096, kReadWrite, kPrivate, -1}},
                          {SYS_mmap, {0, 4096, PROT_NONE, kPrivate, -1}},
                          {SYS_mremap, {0, 4096, 8192, MREMAP_MAYMOVE}},
                          {SYS_madvise, {0, 0, MADV_DONTNEED}},
                          {SYS_clock_gettime, {CLOCK_MONOTONIC}}};
  const Call forbidden[] = {
      {SYS_read, {1}},
      {SYS_write},
      {SYS_write, {1}},
      {SYS_writev, {3}},
      {SYS_pselect6, {4, 0, 0, 0, reinterpret_cast<long>(&noTime)}},
      {SYS_mmap, {0, 4096, PROT_READ | PROT_EXEC, kPrivate, -1}},
      {SYS_mmap, {0, 4096, kReadWrite | PROT_EXEC, kPrivate, -1}},
      {SYS_mmap, {0, 4096, kReadWrite | (1L << 32), kPrivate, -1}},
      {SYS_mmap, {0, 4096, kReadWrite, MAP_SHARED | MAP_ANONYMOUS, -1}},
      {SYS_mmap, {code, 4096, kReadWrite, kPrivate | MAP_FIXED, -1}},
      {SYS_mmap, {0, 4096, PROT_READ, MAP_PRIVATE, 0}},
      {SYS_mmap, {0, 4096, PROT_READ, kPrivate, 0}},
      {SYS_mprotect, {code, 4096, kReadWrite}},
      {SYS_mremap, {code, 4096, 4096, MREMAP_MAYMOVE | MREMAP_FIXED, 1L << 32}},
      {SYS_madvise, {code, 4096, MADV_REMOVE}},
      {SYS_clock_gettime, {-6}},  // a clock that a file stands for
      {SYS_tgkill, {1, 1, SIGABRT}},
      {SYS_tgkill, {getpid(), getpid(), SIGABRT}},
      {0x40000000 | SYS_getpid}};  // by the numbers of x32
  std::set<long> listed = {SYS_openat, SYS_tgkill};
  for (const long number : {SYS_brk, SYS_munmap, SYS_restart_syscall, SYS_exit_group,
                            SYS_rt_sigprocmask, SYS_getpid, SYS_gettid}) {
    EXPECT_NE(sandboxedOutcomeOf({number}), "SIGSYS") << number;
    listed.insert(number);
  }
  for (const Call& call : allowed) {
    EXPECT_NE(sandboxedOutcomeOf(call), "SIGSYS") << "row " << &call - allowed;
    listed.insert(call.number);
  }
  for (const Call& call : forbidden) {
    EXPECT_EQ(sandboxedOutcomeOf(call), "SIGSYS") << "row " << &call - forbidden;
  }
  // Newer kernels ask no filter about uretprobe and uprobe, which fail outside of a trace.
  for (long number = 0; number < 512; ++number) {
    if (number == 335 || number == 336) {
      EXPECT_NE(sandboxedOutcomeOf({number}), "returned");
    } else if (!listed.contains(number)) {
      EXPECT_EQ(sandboxedOutcomeOf({number}), "SIGSYS") << "system call " << number;
    }
  }
  for (const long flags : {O_RDONLY, O_CREAT | O_WRONLY}) {
    EXPECT_EQ(sandboxedOutcomeOf({SYS_openat, {AT_FDCWD, path, flags, 0600}}), "ENOENT");
  }
  for (const long signal : {0, 1, SIGABRT - 1, SIGABRT, SIGABRT + 1, 64}) {
    EXPECT_EQ(sandboxedOutcomeOf([&] { return syscall(SYS_tgkill, getpid(), gettid(), signal); }),
              signal == SIGABRT ? "SIGABRT" : "SIGSYS");
  }
}

#ifdef __x86_64__
TEST_F(SandboxTest, FiltersCallsByThe32BitGate) {
  const auto getpidByTheGate = [] {
    long result = 20;
    asm volatile("int $0x80" : "+a"(result) : : "memory");
    return result;
  };
  if (outcomeOf(getpidByTheGate) == "SIGSEGV") GTEST_SKIP() << "this kernel has no such gate";
  EXPECT_EQ(sandboxedOutcomeOf(getpidByTheGate), "SIGSYS");
}
#endif

TEST_F(SandboxTest, NamesForbiddenCallOnStandardError) {
  const auto callSocket = [] { return syscall(SYS_socket); };
  for (const auto& [number, name] :
       {std::pair<long, std::string>{SYS_socket, " (socket)"}, {511, ""}}) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    const auto call = [forbidden = number] { return enter(), syscall(forbidden); };
    EXPECT_EQ(outcomeOf(call, ends[1]), "SIGSYS");
    char words[100] = {};
    EXPECT_GT(read(ends[0], words, sizeof words - 1), 0);
    EXPECT_EQ(words, "forbidden system call " + std::to_string(number) + name + '\n');
    close(ends[0]);
  }
  const int file = open("/tmp", O_TMPFILE | O_WRONLY, 0600);
  EXPECT_EQ(outcomeOf([&] { return enter(), callSocket(); }, file), "SIGSYS");
  EXPECT_EQ(sandboxedOutcomeOf([&] {
              sigset_t all;
              sigfillset(&all);
              pthread_sigmask(SIG_SETMASK, &all, nullptr);
              return callSocket();
            }),
            "SIGSYS");
}

/// A child that runs `prepare`, sandboxes itself, and computes for ten seconds.
pid_t sandboxedChild(const std::function<void()>& prepare) {
  const pid_t child = fork();
  if (child != 0) return child;
  alarm(10);
  prepare();
  enter();
  for (volatile bool forever = true; forever;) {
  }
  return 0;
}

TEST_F(SandboxTest, ClosesDescriptorsThatWereOpen) {
  int ends[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
  const pid_t child = sandboxedChild([] {});
  close(ends[1]);
  pollfd closed = {ends[0], POLLIN, 0};
  EXPECT_EQ(poll(&closed, 1, 5000), 1) << "the child still holds the other end";
  close(ends[0]);
  kill(child, SIGKILL);
  waitpid(child, nullptr, 0);
}

TEST_F(SandboxTest, EndsWithReaderOfStandardErrorWhenThatIsAPipeInPacketMode) {
  for (const int mode : {O_DIRECT, 0}) {
    int ends[2];
    ASSERT_EQ(pipe2(ends, mode), 0);
    const pid_t child = sandboxedChild([&] {
      close(ends[0]);
      dup2(ends[1], STDERR_FILENO);
    });
    close(ends[1]);
    usleep(100'000);
    EXPECT_EQ(waitpid(child, nullptr, WNOHANG), 0);
    close(ends[0]);
    usleep(mode == 0 ? 100'000 : 0);
    if (mode == 0) kill(child, SIGUSR1);  // other processes may share this pipe
    int status = 0;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(WTERMSIG(status), mode == 0 ? SIGUSR1 : SIGKILL);
  }
}

TEST(WipeMemory, LeavesStackInUseWhereverItEndsInAPage) {
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
}  // namespace ironmoat::sandbox
