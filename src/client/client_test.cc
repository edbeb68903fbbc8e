#include "ironmoat/client.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <filesystem>
#include <future>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ironmoat/command_response.h"
#include "ironmoat/event_loop_client.h"
#include "ironmoat/limits.h"
#include "support/client_outcome.h"
#include "support/leak_check.h"

namespace ironmoat {
namespace {

using namespace std::chrono_literals;
using testing::inWords;
using testing::Outcome;
using testing::Pending;

Client::Options fake(std::chrono::milliseconds deadline = 20s) {
  return testing::optionsFor(FAKE_SERVICE, deadline);
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

std::string outcome(Client& client, const std::string& message) {
  return inWords(client.tryUnpack<VeskCommandResponse>(Data(message)));
}
std::string outcome(Pending& pending) { return inWords(pending.outcome()); }

/// A loop around an EventLoopClient, until `count` completions were called.
class Loop {
 public:
  explicit Loop(Client::Options options) : client_(std::move(options)) {}
  EventLoopClient::Handle submit(const std::string& message) {
    const std::size_t index = outcomes_.size();
    outcomes_.emplace_back();
    return client_.submit<VeskCommandResponse>(Data(message), [this, index](Outcome outcome) {
      outcomes_[index] = inWords(outcome);
      ++completed_;
    });
  }
  const std::vector<std::string>& run(std::size_t count) {
    while (completed_ < count) {
      pollfd ready = {client_.fd(), POLLIN, 0};
      ::poll(&ready, 1, client_.timeout());
      client_.dispatch();
    }
    return outcomes_;
  }
  EventLoopClient& client() { return client_; }

 private:
  EventLoopClient client_;
  std::vector<std::string> outcomes_;
  std::size_t completed_ = 0;
};

/// Every way to get an outcome.
std::string throughUnpack(Client::Options options, const std::string& message) {
  Client client(std::move(options));
  try {
    return std::to_string(client.unpack<VeskCommandResponse>(Data(message)).command);
  } catch (const ServiceError& error) {
    return inWords(Outcome(error));
  } catch (const DecodingError& error) {
    return inWords(Outcome(error));
  }
}
std::string throughPending(Client::Options options, const std::string& message) {
  Client client(std::move(options));
  Pending pending = submit(client, message);
  return outcome(pending);
}
std::string throughCompletion(Client::Options options, const std::string& message) {
  Client client(std::move(options));
  std::promise<std::string> outcome;
  client.submit<VeskCommandResponse>(
      Data(message), [&](Outcome completed) { outcome.set_value(inWords(completed)); });
  return outcome.get_future().get();
}
std::string throughLoop(Client::Options options, const std::string& message) {
  Loop loop(std::move(options));
  loop.submit(message);
  return loop.run(1)[0];
}
constexpr auto kWays = {throughUnpack, throughPending, throughCompletion, throughLoop};

void expectEchoes(std::vector<Pending>& all) {
  for (std::size_t i = 0; i < all.size(); ++i) EXPECT_EQ(outcome(all[i]), std::to_string(i));
}

class ClientTest : public testing::LeakCheck {
 public:
  static void TearDownTestSuite() { std::filesystem::remove_all(ownFolder()); }
};

TEST_F(ClientTest, GivesEachReplyAsItsOutcomeInEveryWay) {
  const struct {
    std::string message;
    std::string outcome;
  } rows[] = {
      {"echo -3", "-3"},
      {"refuse", "typeMismatch at a[1].b: expected data"},
      {"notServed", "unavailable: nobody unpacks this"},
      {"exit 3", "crashed: the service exited with status 3 over this message"},
      {"hang", "timedOut: no reply within 200 ms"},
      {std::string(limits::messageBytes + 1, 'x'),
       "limitExceeded at : message of 16777217 bytes exceeds the limit of 16777216"},
      {"echo 1" + std::string(limits::messageBytes - 6, ' '), "1"},
  };
  for (const auto& row : rows) {
    const bool hangs = row.message == "hang";
    for (const auto way : kWays) {
      EXPECT_EQ(way(fake(hangs ? 200ms : 20s), row.message), row.outcome);
    }
  }
}

// S14, S15.
TEST_F(ClientTest, FailsTheCulpritAndNotItsNeighbours) {
  const struct {
    std::string message;
    std::string service;
  } rows[] = {
      {"signal 10", "was killed by SIGUSR1 over this message"},
      {"words", "was killed by SIGABRT (last words of it) over this message"},
      {"exit 3", "exited with status 3 over this message"},
      {"close", "closed its connection over this message"},
      {"stopReading", "closed its connection over this message"},
      {"nextId", "sent a broken frame over this message: a reply to no request"},
      {"twiceOther", "sent a broken frame over this message: a reply to no request"},
      {"absurdLength", "sent a broken frame over this message: "},
      {"badRecord", "sent a broken record over this message: "},
      {"badStatus", "sent a broken frame over this message: "},
      {"badText", "sent a broken frame over this message: "},
      {"greetAgain", "sent a broken frame over this message: "},
      {"flood", "sent a broken frame over this message: not a valid status: 170"},
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

TEST_F(ClientTest, BlamesEachOfManyCulpritsInARow) {
  Client::Options all = fake();
  all.processes = 1;
  Client client(all);
  for (int i = 0; i < 6; ++i) {
    EXPECT_EQ(outcome(client, "exit 3").substr(0, 8), "crashed:") << i;
    Pending culprit = submit(client, "exit 3");
    Pending neighbour = i < 4 ? Pending() : submit(client, "echo 1");
    EXPECT_EQ(outcome(culprit).substr(0, 8), "crashed:") << i;
    if (neighbour.valid()) {
      EXPECT_EQ(outcome(neighbour), "1") << "after " << i;
    }
  }
}

TEST_F(ClientTest, IgnoresUnsolicitedReplies) {
  for (const char* first : {"takeOver 1", "twice 1", "unasked 1", "foresee 1"}) {
    Client client(fake(300ms));
    EXPECT_EQ(outcome(client, first), "1") << "answered before it shows";
    std::this_thread::sleep_for(20ms);
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(outcome(client, "echo 2"), "2") << first;
    EXPECT_LT(std::chrono::steady_clock::now() - start, 200ms) << first << " waited for a deadline";
    EXPECT_EQ(client.stats().started, 2U) << first;
  }
}

TEST_F(ClientTest, StopsStartingAServiceThatNeverAnswers) {
  for (const char* name : {"chatty", "leaves_after_hello", "leaves"}) {
    Client client(testing::optionsFor(fakeCalled(name), 2s));
    for (int i = 0; i < 3; ++i) {
      const std::string got = outcome(client, "echo 1");
      EXPECT_TRUE(got.starts_with("unavailable: ") || got.starts_with("crashed: ")) << got;
    }
    EXPECT_LE(client.stats().started, 9U) << name;
  }
}

TEST_F(ClientTest, TimesOutOnlyTheRequestThatHangs) {
  for (const char* message : {"hang", "drip"}) {
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

TEST_F(ClientTest, SubmitWaitsWhileTooManyBytesAreInFlight) {
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

TEST_F(ClientTest, OutcomesComeWhicheverThreadWaits) {
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

TEST_F(ClientTest, ACancelledThreadHoldsUpNoOther) {
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

TEST_F(ClientTest, IsUnavailableWithoutAUsableService) {
  const struct {
    std::string program;
    std::string outcome;
  } rows[] = {
      {"/nonexistent/service", "cannot start /nonexistent/service: No such file or directory"},
      {"/", "cannot start /: Permission denied"},
      {"/bin/ls", "/bin/ls is unusable: "},
      {fakeCalled("leaves"), "leaves exited with status 5 before its hello"},
      {fakeCalled("lacks_a_part"), "part of its sandbox: no new privileges) before its hello"},
      {fakeCalled("unsandboxed"), "unsandboxed is unusable: its sandbox lacks: "},
      {fakeCalled("garbled"), "garbled is unusable: "},
      {fakeCalled("other_limits"), "other_limits is unusable: its limits differ"},
      {fakeCalled("silent"), "silent sent no hello before the start deadline"},
  };
  for (const auto& row : rows) {
    Client client(testing::optionsFor(row.program, 1ms));
    Pending first = submit(client, "echo 1");
    for (const std::string& got : {outcome(client, "echo 2"), outcome(first)}) {
      EXPECT_TRUE(got.starts_with("unavailable: ")) << got;
      EXPECT_NE(got.find(row.outcome), std::string::npos) << got;
    }
  }
}

TEST_F(ClientTest, UsesAServiceThatWasInstalledLater) {
  const std::string program = fakeCalled("replaced");
  std::filesystem::remove(program);
  Client client(testing::optionsFor(program, 2s));
  for (int i = 0; i < 4; ++i) EXPECT_EQ(outcome(client, "echo 1").substr(0, 11), "unavailable");
  fakeCalled("replaced");
  EXPECT_EQ(outcome(client, "echo 1"), "1");
}

/// Calls `act` in so many threads at once and waits for them.
template <class Act>
void inThreads(int count, Act act) {
  std::vector<std::thread> threads;
  for (int i = 0; i < count; ++i) threads.emplace_back([&act, i] { act(i); });
  for (std::thread& thread : threads) thread.join();
}

TEST_F(ClientTest, RunsAsManyProcessesAsAreBusyUpToTheLimit) {
  Client::Options all = fake();
  all.processes = 3;
  all.idleTime = 500ms;
  Client client(all);
  for (int i = 0; i < 5; ++i) EXPECT_EQ(outcome(client, "echo 1"), "1");
  EXPECT_EQ(client.stats().started, 1U) << "one caller at a time";
  const auto start = std::chrono::steady_clock::now();
  inThreads(6, [&](int) { EXPECT_EQ(outcome(client, "slow 100"), "100"); });
  const auto took = std::chrono::steady_clock::now() - start;
  EXPECT_GE(took, 200ms);
  EXPECT_EQ(client.stats().started, 3U);
  std::this_thread::sleep_for(600ms);
  for (int i = 0; i < 5; ++i) EXPECT_EQ(outcome(client, "echo 1"), "1");
  EXPECT_EQ(client.stats().started - client.stats().ended, 1U) << "idle ones have been ended";
}

TEST_F(ClientTest, ServesCallersInTheirOrder) {
  Client::Options all = fake();
  all.processes = 1;
  Client client(all);
  std::mutex mutex;
  std::vector<int> order;
  inThreads(5, [&](int i) {
    std::this_thread::sleep_for(i * 40ms);
    EXPECT_EQ(outcome(client, i == 0 ? "slow 300" : "slow 1"), i == 0 ? "300" : "1");
    const std::lock_guard lock(mutex);
    order.push_back(i);
  });
  EXPECT_EQ(order, (std::vector<int>{0, 1, 2, 3, 4}));
}

TEST_F(ClientTest, SlowAndLargeRequestsDoNotHoldUpOthers) {
  Client::Options all = fake();
  all.processes = 2;
  Loop loop(all);
  loop.submit("slow 400");
  loop.submit("slow 5" + std::string(std::size_t{1} << 20, ' '));
  for (int i = 0; i < 20; ++i) loop.submit("echo " + std::to_string(i));
  const auto start = std::chrono::steady_clock::now();
  EXPECT_EQ(loop.run(21)[0], "") << "the slow one is the last";
  EXPECT_LT(std::chrono::steady_clock::now() - start, 300ms);
  EXPECT_EQ(loop.run(22)[0], "400");
}

TEST_F(ClientTest, ReplacesProcessesWithoutARequestNoticing) {
  Client::Options old = fake();
  old.requestsPerProcess = 10;
  Client client(old);
  for (int i = 0; i < 200; ++i) {
    ASSERT_EQ(outcome(client, "echo 1"), "1");
    std::this_thread::sleep_for(100us);
  }
  EXPECT_GE(client.stats().retired, 4U);
  EXPECT_EQ(client.stats().retried, 0U);

  Client slow(fake(1s));
  for (int i = 0; i < 3; ++i) EXPECT_EQ(outcome(slow, "slow 510"), "510");
  for (int i = 0; i < 50 && slow.stats().retired == 0; ++i) {
    std::this_thread::sleep_for(1ms);
    EXPECT_EQ(outcome(slow, "echo 1"), "1");
  }
  EXPECT_EQ(slow.stats().retired, 1U) << "answers just in time, again and again";
}

TEST_F(ClientTest, ReplacesAProcessThatIsSeldomUsed) {
  Client::Options old = testing::optionsFor(fakeCalled("late"), 1s);
  old.requestsPerProcess = 1;
  Client client(old);
  EXPECT_EQ(outcome(client, "echo 1"), "1");
  std::this_thread::sleep_for(2100ms);  // longer than a start may take
  EXPECT_EQ(outcome(client, "echo 2"), "2");
  EXPECT_EQ(client.stats().retired, 1U);
}

TEST_F(ClientTest, KeepsAProcessThatCannotBeReplaced) {
  Client::Options old = fake();
  old.program = fakeCalled("passing");
  old.processes = old.requestsPerProcess = 1;
  Loop loop(old);
  loop.submit("echo 1");
  EXPECT_EQ(loop.run(1)[0], "1");
  std::filesystem::remove(old.program);
  int answered = 0;
  const auto until = std::chrono::steady_clock::now() + 5s;
  for (int i = 1; i <= 5; ++i) {
    loop.client().submit<VeskCommandResponse>(Data("echo 2"), [&](const Outcome& outcome) {
      EXPECT_EQ(inWords(outcome), "2");
      ++answered;
    });
    while (answered < i && std::chrono::steady_clock::now() < until) loop.client().dispatch();
  }
  EXPECT_EQ(answered, 5);
}

TEST_F(ClientTest, KeepsAProcessWhoseSuccessorIsUnusable) {
  for (const char* successor : {"/bin/false", "/bin/ls", "/bin/cat"}) {  // dies, lies, hangs
    Client::Options old = fake();
    old.program = fakeCalled("passing");
    old.requestsPerProcess = 2;
    Client client(old);
    EXPECT_EQ(outcome(client, "echo 1"), "1");
    std::filesystem::remove(old.program);
    std::filesystem::create_symlink(successor, old.program);
    for (int i = 0; i < 4; ++i) {
      EXPECT_EQ(outcome(client, "echo 2"), "2") << successor;
      std::this_thread::sleep_for(20ms);
    }
    EXPECT_EQ(client.stats().started, 1U) << successor;
  }
}

TEST_F(ClientTest, LoopSleepsWhileARequestIsHeldBack) {
  Client::Options all = fake();
  all.processes = 1;
  Loop loop(all);
  loop.submit("echo 0");
  loop.run(1);
  loop.submit("slow 300");
  for (int i = 0; i < 5; ++i) loop.submit("echo 1");
  loop.client().dispatch();
  loop.submit("echo 1");
  loop.client().dispatch();
  pollfd ready = {loop.client().fd(), POLLIN, 0};
  EXPECT_EQ(::poll(&ready, 1, 50), 0) << "nothing to do before the slow one has its reply";
  loop.run(8);
}

TEST_F(ClientTest, ACompletionMaySubmitWhileItsClientEnds) {
  std::string outcomes;
  {
    Client client(fake());
    client.submit<VeskCommandResponse>(Data("hang"), [&](const Outcome&) {
      const auto started = client.stats().started;
      client.submit<VeskCommandResponse>(
          Data("echo 1"), [&](const Outcome& outcome) { outcomes += inWords(outcome); });
      EXPECT_EQ(client.stats().started, started);
      EXPECT_EQ(outcomes, "unavailable: the client was destroyed");
    });
    std::this_thread::sleep_for(20ms);
  }
  EXPECT_EQ(outcomes, "unavailable: the client was destroyed");
}

TEST_F(ClientTest, APendingThatOutlivesItsClientKeepsNoDescriptor) {
  auto client = std::make_unique<Client>(fake());
  Pending pending = submit(*client, "ignore");
  client.reset();
  expectNoLeak();
  EXPECT_EQ(outcome(pending), "unavailable: the client was destroyed");
}

TEST_F(ClientTest, CompletionsAreNeverCalledBySubmit) {
  Client client(fake());
  for (const std::string& message : {std::string(limits::messageBytes + 1, 'x'), std::string()}) {
    std::promise<std::thread::id> thread;
    client.submit<VeskCommandResponse>(
        Data(message), [&](const Outcome&) { thread.set_value(std::this_thread::get_id()); }, 50ms);
    EXPECT_NE(thread.get_future().get(), std::this_thread::get_id());
  }
}

TEST_F(ClientTest, HoldsRecordsUpToALimit) {
  Client::Options options = fake();
  options.maxBytesHeld = 1;
  Client client(options);
  auto all = submitEchoes(client, 2);
  all[1].wait();
  EXPECT_GT(client.stats().bytesHeld, 1U) << "the only one";
  EXPECT_EQ(outcome(all[1]), "out of memory");
  EXPECT_EQ(outcome(all[0]), "0");
  EXPECT_EQ(client.stats().bytesHeld, 0U);
  all = submitEchoes(client, 1);
  all[0].wait();
  all.clear();
  EXPECT_EQ(outcome(client, "echo 2"), "2");
}

TEST_F(ClientTest, CountsWhatItDoes) {
  Client::Options options = fake(200ms);
  std::vector<std::string> losses;
  options.onProcessLost = [&](std::string_view why) { losses.emplace_back(why); };
  Client client(options);
  for (const char* message : {"echo 1", "echo 2", "refuse", "exit 1", "hang", "notServed"}) {
    outcome(client, message);
  }
  Pending pending = submit(client, "slow 50");
  EXPECT_EQ(client.stats().inFlight, 1U);
  EXPECT_EQ(client.stats().bytesInFlight, 7U);
  EXPECT_EQ(outcome(pending), "50");
  const Stats stats = client.stats();
  EXPECT_EQ(stats.accepted, 3U);
  EXPECT_EQ(stats.rejected[static_cast<int>(DecodingError::Kind::typeMismatch)], 1U);
  EXPECT_EQ(stats.crashed, 1U);
  EXPECT_EQ(stats.timedOut, 1U);
  EXPECT_EQ(stats.unavailable, 1U);
  EXPECT_EQ(stats.retried, 1U);
  EXPECT_EQ(stats.started - stats.ended, 2U);
  EXPECT_EQ(stats.inFlight, 0U);
  EXPECT_EQ(losses, (std::vector<std::string>{"exited with status 1", "exited with status 1",
                                              "no reply within 200 ms"}));

  Loop loop(fake());
  loop.submit(std::string(limits::messageBytes + 1, 'x'));
  EXPECT_EQ(loop.client().stats().inFlight, 1U) << "its completion is to be called";
  loop.run(1);
  EXPECT_EQ(loop.client().stats().inFlight, 0U);
}

TEST_F(ClientTest, TakesADeadlineForEachRequest) {
  Client client(fake(20s));
  const auto late = client.tryUnpack<VeskCommandResponse>(Data(std::string("hang")), 100ms);
  EXPECT_EQ(inWords(late), "timedOut: no reply within 100 ms");
  Pending pending = client.submit<VeskCommandResponse>(Data(std::string("hang")), 100ms);
  EXPECT_EQ(outcome(pending), "timedOut: no reply within 100 ms");
}

TEST_F(ClientTest, CancelsARequestOfALoop) {
  Loop loop(fake(20s));
  loop.submit("slow 50");
  const auto inFlight = loop.submit("hang");
  loop.client().dispatch();
  const auto unsent = loop.submit("hang");
  EXPECT_TRUE(loop.client().cancel(unsent));
  loop.run(1);
  EXPECT_TRUE(loop.client().cancel(inFlight));
  loop.submit("echo 7");
  const auto done = loop.submit("echo 8");
  const auto outcomes = loop.run(3);
  EXPECT_EQ(outcomes[1] + outcomes[2], "");
  EXPECT_EQ(outcomes[3] + outcomes[4], "78");
  EXPECT_FALSE(loop.client().cancel(done));
  EXPECT_FALSE(loop.client().cancel(inFlight)) << "once is enough";
  bool cancelledItself = true;
  EventLoopClient::Handle own;
  own = loop.client().submit<VeskCommandResponse>(Data("echo 9"), [&](const Outcome&) {
    cancelledItself = loop.client().cancel(own);
    loop.client().submit<VeskCommandResponse>(Data("echo 10"), [](const Outcome&) {});
  });
  loop.submit("echo 11");
  loop.run(4);
  EXPECT_FALSE(cancelledItself);
  EXPECT_EQ(loop.client().stats().cancelled, 1U) << "the other has not been answered yet";
}

TEST_F(ClientTest, GivesTheServiceNothingOfTheDaemons) {
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
  Loop loop(fake());
  loop.submit("echo 1");  // never sent
  const pid_t child = ::fork();
  if (child == 0) {
    const bool refused = outcome(*client, "echo 2").starts_with("unavailable: ") &&
                         outcome(begun).starts_with("unavailable: ") &&
                         loop.client().timeout() == -1;
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
