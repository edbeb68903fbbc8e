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
#include <chrono>
#include <string>
#include <string_view>
#include <vector>

#include "ironmoat/client.h"
#include "ironmoat/command_response.h"
#include "ironmoat/event_loop_client.h"
#include "support/client_outcome.h"
#include "support/leak_check.h"

namespace {

std::string_view failingCall;
int failingError = 0;
std::atomic<int> untilFailure = 0;  // uses of the call; 0: none fails any more
constexpr int kAllFail = -1;

bool fails(std::string_view call) {
  if (call == failingCall && untilFailure == kAllFail) {
    errno = failingError;
    return true;
  }
  if (call != failingCall || untilFailure.load() <= 0 || untilFailure.fetch_sub(1) != 1) {
    return false;
  }
  errno = failingError;
  return true;
}

}  // namespace

// NOLINTBEGIN(bugprone-reserved-identifier): as the linker calls them
#define WRAP(type, name, parameters, arguments) \
  extern "C" type __real_##name parameters;     \
  extern "C" type __wrap_##name parameters;     \
  type __wrap_##name parameters { return fails(#name) ? -1 : __real_##name arguments; }

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

extern "C" int __real_posix_spawn(pid_t*, const char*, const posix_spawn_file_actions_t*,
                                  const posix_spawnattr_t*, char* const*, char* const*);
extern "C" int __wrap_posix_spawn(pid_t* pid, const char* path,
                                  const posix_spawn_file_actions_t* actions,
                                  const posix_spawnattr_t* attributes, char* const* arguments,
                                  char* const* environment) {
  if (fails("posix_spawn")) return failingError;
  return __real_posix_spawn(pid, path, actions, attributes, arguments, environment);
}
// NOLINTEND(bugprone-reserved-identifier)

namespace ironmoat {
namespace {

using namespace std::chrono_literals;
using testing::inWords;
using testing::Outcome;

/// The record's command or the kind of the error.
std::string brief(const Outcome& outcome) {
  const std::string words = inWords(outcome);
  return words.substr(0, words.find(':'));
}

/// Each way to an outcome, a death of the service among them. Returns what came of each.
std::vector<std::string> useClients(const ClientOptions& options) {
  std::vector<std::string> outcomes;
  {
    Client client(options);
    for (const char* message : {"echo 1", "exit 3", "echo 2"}) {
      outcomes.push_back(brief(client.tryUnpack<VeskCommandResponse>(Data(std::string(message)))));
    }
    auto first = client.submit<VeskCommandResponse>(Data(std::string("echo 3")));
    auto second = client.submit<VeskCommandResponse>(Data(std::string("slow 4")));
    outcomes.push_back(brief(first.outcome()));
    outcomes.push_back(brief(second.outcome()));
  }
  EventLoopClient loop(options);
  for (const char* message : {"echo 5", "echo 6"}) {
    bool done = false;
    loop.submit<VeskCommandResponse>(Data(std::string(message)), [&](const Outcome& outcome) {
      outcomes.push_back(brief(outcome));
      done = true;
    });
    while (!done) {
      pollfd ready = {loop.fd(), POLLIN, 0};
      ::poll(&ready, 1, loop.timeout());
      loop.dispatch();
    }
  }
  return outcomes;
}

const std::vector<std::string> kUsual = {"1", "crashed", "2", "3", "4", "5", "6"};

class SystemCallsTest : public testing::LeakCheck {};

TEST_F(SystemCallsTest, FailureOfAnyCallCostsAtMostARetry) {
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
  const ClientOptions options = testing::optionsFor(FAKE_SERVICE, 5s);
  for (const auto& row : rows) {
    failingCall = row.call;
    int failures = 0;
    for (const int error : row.errors) {
      failingError = error;
      for (int use = 1; use <= 40; ++use) {
        untilFailure = use;
        const auto start = std::chrono::steady_clock::now();
        const auto outcomes = useClients(options);
        EXPECT_EQ(outcomes, kUsual) << row.call << " with " << error << " at use " << use;
        EXPECT_LT(std::chrono::steady_clock::now() - start, 3s)
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
TEST_F(SystemCallsTest, WorksWithoutProcessDescriptors) {
  failingCall = "syscall";
  failingError = ENOSYS;
  untilFailure = kAllFail;
  EXPECT_EQ(useClients(testing::optionsFor(FAKE_SERVICE)), kUsual);
  untilFailure = 0;
}

TEST_F(SystemCallsTest, AnEventLoopClientWithoutADescriptorThrows) {
  failingCall = "epoll_create1";
  failingError = EMFILE;
  untilFailure = 1;
  EXPECT_THROW(EventLoopClient(), std::system_error);
  untilFailure = 1;
  Client client;
  EXPECT_EQ(inWords(client.submit<VeskCommandResponse>(Data(std::string("x"))).outcome()),
            "unavailable: cannot start the client's thread: epoll_create1: Too many open files");
}

}  // namespace
}  // namespace ironmoat
