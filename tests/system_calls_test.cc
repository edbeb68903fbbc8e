// What becomes of requests when a system call of the client fails: each call fails once, at its
// first, second, ... use, with each error that it may have. (S16)
//
// The linker leads the client's calls here (--wrap).

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <spawn.h>
#include <sys/epoll.h>
#include <sys/random.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <string>
#include <string_view>
#include <vector>

#include "support/clients.h"

namespace {

std::string_view failingCall;
int failingError = 0;
std::atomic<int> untilFailure = 0;  // uses of the call; 0: none fails any more
constexpr int kAllFail = -1;

bool fails(std::string_view call) {
  if (call != failingCall) return false;
  const bool all = untilFailure == kAllFail;
  if (!all && (untilFailure <= 0 || --untilFailure != 0)) return false;
  errno = failingError;
  return true;
}

}  // namespace

// NOLINTBEGIN(bugprone-reserved-identifier): as the linker calls them
#define WRAP_FAILING(result, type, name, parameters, arguments) \
  extern "C" type __real_##name parameters;                     \
  extern "C" type __wrap_##name parameters;                     \
  type __wrap_##name parameters { return fails(#name) ? (result) : __real_##name arguments; }
#define WRAP(type, name, parameters, arguments) WRAP_FAILING(-1, type, name, parameters, arguments)

WRAP(int, socketpair, (int d, int t, int p, int* ends), (d, t, p, ends))
WRAP(int, pipe2, (int* ends, int flags), (ends, flags))
WRAP(int, fcntl, (int fd, int command, int argument), (fd, command, argument))
WRAP(int, waitid, (idtype_t t, id_t id, siginfo_t* info, int o), (t, id, info, o))
WRAP(int, poll, (pollfd * fds, nfds_t count, int time), (fds, count, time))
WRAP(int, epoll_create1, (int flags), (flags))
WRAP(int, epoll_ctl, (int ep, int o, int fd, epoll_event* e), (ep, o, fd, e))
WRAP(int, epoll_wait, (int ep, epoll_event* e, int n, int time), (ep, e, n, time))
WRAP(ssize_t, recv, (int fd, void* to, std::size_t n, int flags), (fd, to, n, flags))
WRAP(ssize_t, sendmsg, (int fd, const msghdr* m, int flags), (fd, m, flags))
WRAP(ssize_t, read, (int fd, void* to, std::size_t n), (fd, to, n))
WRAP(ssize_t, getrandom, (void* to, std::size_t n, unsigned f), (to, n, f))
WRAP(long, syscall, (long n, long a, long b, long c, long d), (n, a, b, c, d))
using Actions = const posix_spawn_file_actions_t*;
using Attributes = const posix_spawnattr_t*;
WRAP_FAILING(failingError, int, posix_spawn,
             (pid_t * pid, const char* path, Actions a, Attributes s, char* const* arguments,
              char* const* environment),
             (pid, path, a, s, arguments, environment))
// NOLINTEND(bugprone-reserved-identifier)

namespace ironmoat::testing {
namespace {

/// The record's command or the kind of the error.
std::string brief(const std::string& outcome) { return outcome.substr(0, outcome.find(':')); }

/// Each way to an outcome, a death of the service among them. Returns what came of each.
std::vector<std::string> useClients() {
  const ClientOptions options = optionsFor(FAKE_SERVICE, 5s);
  std::vector<std::string> outcomes;
  {
    Client client(options);
    for (const char* message : {"answer 1", "exit 3", "answer 2"}) {
      outcomes.push_back(brief(outcome(client, message)));
    }
    Pending first = submit(client, "answer 3");
    Pending second = submit(client, "sleep 1;answer 4");
    outcomes.push_back(brief(outcome(first)));
    outcomes.push_back(brief(outcome(second)));
  }
  Loop loop(options);
  for (const char* message : {"answer 5", "answer 6"}) {
    loop.submit(message);
    outcomes.push_back(brief(loop.run(outcomes.size() - 4).back()));
  }
  return outcomes;
}

const std::vector<std::string> kUsual = {"1", "crashed", "2", "3", "4", "5", "6"};

using SystemCalls = LeakCheck;

TEST_F(SystemCalls, CostAtMostARetryWhenOneFails) {
  const struct {
    std::string_view call;
    std::vector<int> errors;
  } rows[] = {
      {"socketpair", {EMFILE}},    {"pipe2", {EMFILE}},          {"fcntl", {EMFILE}},
      {"posix_spawn", {EAGAIN}},   {"syscall", {EPERM}},  // pidfd_open, pidfd_send_signal
      {"waitid", {EINTR, EINVAL}}, {"sendmsg", {EAGAIN, EPIPE}}, {"recv", {EAGAIN, ECONNRESET}},
      {"poll", {EINTR}},           {"epoll_ctl", {ENOMEM}},      {"epoll_wait", {EINTR}},
      {"read", {EAGAIN}},          {"getrandom", {ENOSYS}},
  };
  for (const auto& row : rows) {
    failingCall = row.call;
    int failures = 0;
    for (const int error : row.errors) {
      failingError = error;
      for (int use = 1; use < 1000; use += use < 20 ? 1 : use / 4) {
        untilFailure = use;
        const auto start = std::chrono::steady_clock::now();
        EXPECT_EQ(useClients(), kUsual) << row.call << " with " << error << " at use " << use;
        EXPECT_LT(std::chrono::steady_clock::now() - start, 4s)
            << row.call << " with " << error << " at use " << use << " waited for a deadline";
        if (untilFailure > 0) break;  // it is not used so often
        ++failures;
      }
    }
    untilFailure = 0;
    EXPECT_GT(failures, 0) << row.call << " is not used";
  }
}

/// As under valgrind and in containers that refuse them.
TEST_F(SystemCalls, WorkWithoutProcessDescriptors) {
  failingCall = "syscall";
  failingError = ENOSYS;
  untilFailure = kAllFail;
  EXPECT_EQ(useClients(), kUsual);
  untilFailure = 0;
}

TEST_F(SystemCalls, MakeRequestsUnavailableWhenTheClientCannotStart) {
  failingCall = "epoll_create1";
  failingError = EMFILE;
  untilFailure = 1;
  EXPECT_THROW(EventLoopClient(), std::system_error);
  Client client(optionsFor(FAKE_SERVICE));
  untilFailure = 1;
  Pending pending = submit(client, "answer 1");
  EXPECT_EQ(outcome(pending),
            "unavailable: cannot start the client's thread: epoll_create1: Too many open files");
  // The child has gone already, its number may have passed to another process.
  failingCall = "waitid";
  failingError = ECHILD;
  untilFailure = 1;
  EXPECT_EQ(outcome(client, "answer 1"),
            "unavailable: cannot start " FAKE_SERVICE ": No child processes");
  EXPECT_GT(::waitpid(-1, nullptr, 0), 0);
}

}  // namespace
}  // namespace ironmoat::testing
