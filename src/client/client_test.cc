#include "ironmoat/client.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <pthread.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <exception>
#include <filesystem>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "client/connection.h"
#include "ironmoat/command_response.h"
#include "ironmoat/limits.h"
#include "support/leaves_nothing.h"

namespace ironmoat {
namespace {

using namespace std::chrono_literals;
using Pending = ironmoat::Pending<ironmoat::VeskCommandResponse>;

Client::Options options(std::string program, std::chrono::milliseconds deadline) {
  Client::Options all;
  all.program = std::move(program);
  all.deadline = deadline;
  return all;
}
Client::Options fake(std::chrono::milliseconds deadline = 20s) {
  return options(FAKE_SERVICE, deadline);
}

std::filesystem::path ownFolder() {
  return std::filesystem::path(::testing::TempDir()) /
         ("client_test." + std::to_string(::getpid()));
}

/// The fake service under another name, which decides how it starts.
std::string fakeCalled(const std::string& name) {
  const auto folder = ownFolder();
  std::filesystem::create_directories(folder);
  std::filesystem::remove(folder / name);
  std::filesystem::create_symlink(FAKE_SERVICE, folder / name);
  return folder / name;
}

Pending submit(Client& client, const std::string& message) {
  return client.submit<VeskCommandResponse>(Data(message));
}
std::vector<Pending> submitEchoes(Client& client, int count) {
  std::vector<Pending> all;
  for (int i = 0; i < count; ++i) all.push_back(submit(client, "echo " + std::to_string(i)));
  return all;
}

/// What comes of it, as text: the record's number, or the error.
template <class Call>
std::string textOf(Call record) {
  try {
    return std::to_string(record().command);
  } catch (const ServiceError& error) {
    return std::string(nameOf(error.kind())) + ": " + error.what();
  } catch (const DecodingError& error) {
    return std::string(nameOf(error.kind())) + " at " + error.path() + ": " + error.what();
  }
}
std::string outcome(Client& client, const std::string& message) {
  return textOf([&] { return client.unpack<VeskCommandResponse>(Data(message)); });
}
std::string outcome(Pending& pending) {
  return textOf([&] { return pending.get(); });
}
void expectEchoes(std::vector<Pending>& all) {
  for (std::size_t i = 0; i < all.size(); ++i) EXPECT_EQ(outcome(all[i]), std::to_string(i));
}

class ClientTest : public testing::LeavesNothing {
 public:
  static void TearDownTestSuite() { std::filesystem::remove_all(ownFolder()); }
};

TEST_F(ClientTest, EachKindOfReplyIsItsOutcome) {
  Client client(fake());
  EXPECT_EQ(outcome(client, "echo -3"), "-3");
  EXPECT_EQ(outcome(client, "refuse"), "typeMismatch at a[1].b: expected data");
  EXPECT_EQ(outcome(client, "notServed"), "unavailable: nobody unpacks this");
  EXPECT_EQ(outcome(client, std::string(limits::messageBytes + 1, 'x')),
            "limitExceeded at : message of 16777217 bytes, more than 16777216");
  EXPECT_EQ(outcome(client, "echo 1" + std::string(limits::messageBytes - 6, ' ')), "1");
}

// S14, S15.
TEST_F(ClientTest, TheCulpritFailsAndItsNeighboursDoNot) {
  const struct {
    std::string message;
    std::string service;
  } rows[] = {
      {"signal 10", "was killed by SIGUSR1 over this message"},
      {"words", "was killed by SIGABRT (last words of it) over this message"},
      {"exit 3", "exited with status 3 over this message"},
      {"close", "closed its connection over this message"},
      {"nextId", "sent a broken frame over this message: a reply to no request"},
      {"absurdLength", "sent a broken frame over this message: "},
      {"badRecord", "sent a broken record over this message: "},
      {"badStatus", "sent a broken frame over this message: "},
      {"badText", "sent a broken frame over this message: "},
      {"greetAgain", "sent a broken frame over this message: "},
      {"flood", "sent a broken frame over this message: the reply has an unknown status"},
  };
  for (const auto& row : rows) {
    Client client(fake());
    const std::string expected = "crashed: the service " + row.service;
    EXPECT_EQ(outcome(client, row.message).substr(0, expected.size()), expected);
    auto before = submitEchoes(client, 20);
    Pending culprit = submit(client, row.message);
    auto after = submitEchoes(client, 20);
    expectEchoes(before);
    EXPECT_EQ(outcome(culprit).substr(0, expected.size()), expected);
    expectEchoes(after);
  }
}

TEST_F(ClientTest, ATakenOverServiceHarmsNobodyElse) {
  Client client(fake(300ms));
  for (const char* first : {"takeOver 1", "twice 1", "unasked 1"}) {
    EXPECT_EQ(outcome(client, first), "1") << "answered before it shows";
    EXPECT_EQ(outcome(client, "echo 2"), "2");
  }
}

TEST_F(ClientTest, OnlyTheRequestThatHangsTimesOut) {
  for (const char* message : {"ignore", "hang", "drip"}) {
    Client client(fake(300ms));
    auto before = submitEchoes(client, 10);
    Pending culprit = submit(client, message);
    std::vector<Pending> after;  // together longer than a deadline
    for (int i = 0; i < 8; ++i) after.push_back(submit(client, "slow 50"));
    expectEchoes(before);
    EXPECT_EQ(outcome(culprit), "timedOut: no reply within 300 ms") << message;
    for (auto& pending : after) EXPECT_EQ(outcome(pending), "50");
    EXPECT_EQ(outcome(client, message), "timedOut: no reply within 300 ms");
  }
}

TEST_F(ClientTest, BytesInFlightAreBounded) {
  Client::Options all = fake();
  all.maxBytesInFlight = 10000;
  Client client(all);
  EXPECT_EQ(outcome(client, "echo 5" + std::string(20000, ' ')), "5") << "larger, but alone";
  std::atomic<int> submitted = 0;
  Pending slow = submit(client, "slow 200" + std::string(8000, ' '));
  std::thread other([&] {
    for (int i = 0; i < 5; ++i) {
      Pending pending = submit(client, "echo 1" + std::string(4000, ' '));
      ++submitted;
      pending.get();
    }
  });
  std::this_thread::sleep_for(50ms);
  EXPECT_EQ(submitted, 0);
  EXPECT_EQ(outcome(slow), "200");
  other.join();
  EXPECT_EQ(submitted, 5);
}

TEST_F(ClientTest, OutcomesComeWhoeverWaitsForThem) {
  Client::Options all = fake();
  all.maxBytesInFlight = 3000;
  std::vector<Pending> waiting;
  auto client = std::make_unique<Client>(all);
  std::vector<Pending> unheard = submitEchoes(*client, 50);  // beyond the room: the client reads
  Pending first = submit(*client, "slow 10");
  Pending second = submit(*client, "slow 10");
  EXPECT_EQ(first.wait_for(std::chrono::hours::max()), std::future_status::ready);
  EXPECT_EQ(second.wait_until(std::chrono::sys_seconds::max()), std::future_status::ready);
  Pending slow = submit(*client, "slow 100");
  EXPECT_EQ(slow.wait_for(1ms), std::future_status::timeout);
  EXPECT_EQ(slow.wait_for(std::chrono::hours::min()), std::future_status::timeout);
  EXPECT_EQ(slow.wait_until(std::chrono::system_clock::time_point::min()),
            std::future_status::timeout);
  while (slow.wait_for(0s) != std::future_status::ready) {
  }
  EXPECT_EQ(outcome(slow), "100");
  EXPECT_FALSE(slow.valid());
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&client, t] {
      std::vector<Pending> own = submitEchoes(*client, 20);
      Pending last = submit(*client, "slow 20");
      EXPECT_EQ(last.wait_for(t * 1ms), std::future_status::timeout);
      EXPECT_EQ(outcome(last), "20");
      expectEchoes(own);
    });
  }
  for (std::thread& thread : threads) thread.join();

  for (int i = 0; i < 3; ++i) waiting.push_back(submit(*client, "ignore"));
  for (Pending& each : waiting) {
    threads.emplace_back(
        [&each] { EXPECT_EQ(outcome(each), "unavailable: the client was destroyed"); });
  }
  std::this_thread::sleep_for(20ms);
  client.reset();
  for (std::size_t t = 4; t < threads.size(); ++t) threads[t].join();
  expectEchoes(unheard);
}

/// What submits and then waits can be held up in between, for longer than the deadline.
TEST_F(ClientTest, WhoComesLateToWaitIsHeard) {
  struct Plain final : client::Request {
    Plain() : Request(VeskCommandResponse::schemaName, Data("echo 1")) {}
    void give(const frames::Reply& /*reply*/) override {}
    void giveError(std::exception_ptr /*error*/) noexcept override {}
  };
  client::Connection connection(fake(20ms));
  for (const auto late : {0ms, 40ms}) {
    const auto request = std::make_shared<Plain>();
    std::this_thread::sleep_for(late);  // the client's thread falls asleep
    connection.submit(request, client::Connection::Then::waits);
    std::this_thread::sleep_for(late);
    EXPECT_TRUE(connection.await(*request, std::chrono::steady_clock::now() + 10s));
  }
}

TEST_F(ClientTest, WhoeverIsCancelledHoldsUpNobody) {
  Client::Options all = fake();
  all.maxBytesInFlight = 1200;
  Client client(all);
  EXPECT_EQ(outcome(client, "echo 1"), "1");
  Pending slow = submit(client, "slow 100");
  Pending other = submit(client, "echo 2");
  const auto cancel = [](auto call) {
    using Call = decltype(call);
    pthread_t thread{};
    const auto run = [](void* argument) -> void* {
      (*static_cast<Call*>(argument))();
      return nullptr;
    };
    ASSERT_EQ(::pthread_create(&thread, nullptr, run, &call), 0);
    std::this_thread::sleep_for(20ms);
    ::pthread_cancel(thread);
    ::pthread_join(thread, nullptr);
  };
  cancel([&] { submit(client, "echo 3"); });  // waits for room
  slow = submit(client, "slow 100");
  cancel([&] { slow.wait(); });  // reads
  EXPECT_EQ(outcome(other), "2");
  EXPECT_EQ(outcome(slow), "100");
  EXPECT_EQ(outcome(client, "echo 4"), "4");
}

TEST_F(ClientTest, WhatCannotServeIsUnavailable) {
  const struct {
    std::string program;
    std::string outcome;
  } rows[] = {
      {"/nonexistent/service", "cannot start /nonexistent/service: No such file or directory"},
      {"/", "cannot start /: Permission denied"},
      {"/bin/ls", "/bin/ls sent a broken frame: "},
      {fakeCalled("leaves"), "leaves exited with status 5 before it greeted"},
      {fakeCalled("fails_to_confine"), "cannot be had: system call filter) before it greeted"},
      {fakeCalled("unconfined"), "unconfined cannot be used: it is not confined: "},
      {fakeCalled("garbled"), "garbled sent a broken frame: "},
      {fakeCalled("other_limits"), "other_limits cannot be used: its limits are not those"},
      {fakeCalled("silent"), "silent did not greet in time"},
  };
  for (const auto& row : rows) {
    Client client(options(row.program, 1ms));
    Pending first = submit(client, "echo 1");
    for (const std::string& got : {outcome(client, "echo 2"), outcome(first)}) {
      EXPECT_TRUE(got.starts_with("unavailable: ")) << got;
      EXPECT_NE(got.find(row.outcome), std::string::npos) << got;
    }
  }
}

TEST_F(ClientTest, AServiceThatComesBackIsUsed) {
  const std::string program = fakeCalled("replaced");
  std::filesystem::remove(program);
  Client client(options(program, 2s));
  for (int i = 0; i < 4; ++i) EXPECT_EQ(outcome(client, "echo 1").substr(0, 11), "unavailable");
  fakeCalled("replaced");
  EXPECT_EQ(outcome(client, "echo 1"), "1");
}

TEST_F(ClientTest, TheServiceInheritsNothing) {
  const int descriptor = ::open("/dev/null", O_RDONLY);  // without CLOEXEC
  sigset_t blocked;
  sigset_t before;
  sigfillset(&blocked);
  ::pthread_sigmask(SIG_BLOCK, &blocked, &before);
  ::signal(SIGUSR2, SIG_IGN);
  EXPECT_EQ(outcome(*std::make_unique<Client>(fake()), "inherited"), "0");
  ::signal(SIGUSR2, SIG_DFL);
  ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
  ::close(descriptor);
}

void reapAll(int) {
  const int error = errno;
  while (::waitpid(-1, nullptr, WNOHANG) > 0) {
  }
  errno = error;
}

TEST_F(ClientTest, ADaemonThatReapsItsOwnChildrenDoesNoHarm) {
  for (const auto handler : {SIG_IGN, reapAll}) {
    const auto before = ::signal(SIGCHLD, handler);
    {
      Client client(fake());
      EXPECT_EQ(outcome(client, "echo 1"), "1");
      EXPECT_EQ(outcome(client, "exit 3").substr(0, 8), "crashed:");
      EXPECT_EQ(outcome(client, "echo 2"), "2");
    }
    ::signal(SIGCHLD, before);
  }
}

TEST_F(ClientTest, AForkedChildNeitherUsesNorKeepsTheService) {
  int done[2];
  ASSERT_EQ(::pipe(done), 0);
  auto client = std::make_unique<Client>(fake());
  EXPECT_EQ(outcome(*client, "echo 1"), "1");
  Pending begun = submit(*client, "slow 200");
  const pid_t child = ::fork();
  if (child == 0) {
    const bool refused = outcome(*client, "echo 2").starts_with("unavailable: ") &&
                         outcome(begun).starts_with("unavailable: ");
    client.reset();
    char byte = 0;
    // Lives on with copies of the client's descriptors until the parent's client is gone.
    std::_Exit(::read(done[0], &byte, 1) == 1 && refused ? 0 : 1);
  }
  EXPECT_EQ(outcome(begun), "200");
  EXPECT_EQ(outcome(*client, "exit 1").substr(0, 8), "crashed:");
  EXPECT_EQ(outcome(*client, "echo 4"), "4");
  client.reset();
  EXPECT_EQ(::write(done[1], "x", 1), 1);
  int status = -1;
  EXPECT_EQ(::waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
  ::close(done[0]);
  ::close(done[1]);
}

}  // namespace
}  // namespace ironmoat
