#include "ironmoat/client.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <filesystem>
#include <functional>
#include <future>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ironmoat/limits.h"
#include "support/clients.h"

namespace ironmoat::testing {
namespace {

using namespace std::string_literals;
using Clock = std::chrono::steady_clock;

const std::string kDestroyed = "unavailable: the client was destroyed";

Client::Options fake(std::chrono::milliseconds deadline = 20s) {
  return optionsFor(FAKE_SERVICE, deadline);
}

std::vector<Pending> submitAll(Client& client, const std::string& message, int count) {
  std::vector<Pending> all;
  while (count-- > 0) all.push_back(submit(client, message));
  return all;
}
void expectAll(std::vector<Pending>& all, const std::string& expected) {
  for (Pending& each : all) EXPECT_EQ(outcome(each), expected);
}

/// Calls `act` in so many threads at once and waits for them.
void inThreads(int count, const std::function<void(int)>& act) {
  std::vector<std::jthread> threads;
  for (int i = 0; i < count; ++i) threads.emplace_back(act, i);
}

class ClientTest : public LeakCheck {
 public:
  ~ClientTest() override { std::filesystem::remove_all(folder_); }

 protected:
  /// A link to `target` with a name that is not in use.
  [[nodiscard]] std::string link(const std::string& name, const std::string& target) const {
    std::filesystem::create_directories(folder_);
    std::filesystem::remove(folder_ / name);
    std::filesystem::create_symlink(target, folder_ / name);
    return folder_ / name;
  }
  /// The fake service, with `script` for its start.
  [[nodiscard]] std::string starting(const std::string& script) const {
    return link(script, FAKE_SERVICE);
  }

 private:
  std::filesystem::path folder_ =
      std::filesystem::path(::testing::TempDir()) / ("client_test." + std::to_string(::getpid()));
};

/// The outcome of a call that returns a record or throws.
std::string outcomeOf(const std::function<VeskCommandResponse()>& call) {
  try {
    return inWords(Outcome(std::in_place, call));
  } catch (const ServiceError& error) {
    return inWords(Outcome(error));
  } catch (const DecodingError& error) {
    return inWords(Outcome(error));
  }
}

TEST_F(ClientTest, GivesTheSameOutcomeInEveryWay) {
  const struct {
    std::string message;
    std::string outcome;
  } rows[] = {
      {"answer -3", "-3"},
      {"reply \1\2\xff\xff\xff\xff\xff\xff\xff\xff\6\0a[1].bexpected data"s,
       "typeMismatch at a[1].b: expected data"},
      {"reply \2nobody unpacks this", "unavailable: nobody unpacks this"},
      {"exit 3", "crashed: the service exited with status 3 over this message"},
      {"hang", "timedOut: no reply within 100 ms"},
      {std::string(limits::messageBytes + 1, 'x'),
       "limitExceeded at : message of 16777217 bytes exceeds the limit of 16777216"},
      {"answer 1" + std::string(limits::messageBytes - 8, ' '), "1"},
  };
  Client client(fake());
  Loop loop(fake());
  std::size_t looped = 0;
  for (const auto& [text, expected] : rows) {
    const Data message(text);
    const Deadline deadline = text == "hang" ? Deadline(100ms) : Deadline();
    EXPECT_EQ(outcomeOf([&] { return client.unpack<VeskCommandResponse>(message, deadline); }),
              expected);
    EXPECT_EQ(outcome(client, text, deadline), expected);
    Pending pending = submit(client, text, deadline);
    EXPECT_EQ(outcomeOf([&] { return pending.get(); }), expected);
    pending = submit(client, text, deadline);
    EXPECT_EQ(outcome(pending), expected);
    std::promise<std::pair<std::string, std::thread::id>> done;
    const auto complete = [&](const Outcome& outcome) {
      done.set_value({inWords(outcome), std::this_thread::get_id()});
    };
    client.submit<VeskCommandResponse>(message, complete, deadline);
    const auto [completed, thread] = done.get_future().get();
    EXPECT_EQ(completed, expected);
    EXPECT_NE(thread, std::this_thread::get_id());
    loop.submit(text, deadline);
    EXPECT_EQ(loop.client.stats().inFlight, 1U) << "its completion is to be called";
    EXPECT_EQ(loop.run(looped + 1)[looped], expected);
    ++looped;
  }
  const Stats stats = client.stats();
  EXPECT_EQ(stats.accepted, 10U);
  EXPECT_EQ(stats.rejected[static_cast<int>(DecodingError::Kind::typeMismatch)], 5U);
  EXPECT_EQ(stats.rejected[static_cast<int>(DecodingError::Kind::limitExceeded)], 5U);
  EXPECT_EQ(stats.unavailable, 5U);
  EXPECT_EQ(stats.crashed, 5U);
  EXPECT_EQ(stats.timedOut, 5U);
  EXPECT_EQ(stats.retried, 5U);
  EXPECT_EQ(stats.inFlight + stats.bytesInFlight, 0U);
}

// S14, S15.
TEST_F(ClientTest, FailsTheCulpritAndNotItsNeighbours) {
  const std::string crashed = "crashed: the service ";
  const std::string broken = crashed + "sent a broken frame over this message: ";
  const std::string late = "timedOut: no reply within 300 ms";
  const struct {
    std::string message;
    std::string outcome;
    unsigned started = 3;  // processes, for this message and then another
    bool isAlone = false;  // the test with neighbours would take long
    std::string program = FAKE_SERVICE;
  } rows[] = {
      {"signal 10", crashed + "was killed by SIGUSR1 over this message"},
      {"signal 40", crashed + "was killed by signal 40 over this message"},
      {"say last \x1b\xff\n words ~of it\n\n;signal 6",
       crashed + "was killed by SIGABRT (last words ~of it) over this message"},
      {"say " + std::string(500, 'x') + ";exit 3",
       crashed + "exited with status 3 (" + std::string(400, 'x') + ") over this message"},
      {"close;hang", crashed + "closed its connection over this message"},
      {"id 1;answer 1", broken + "a reply to no request"},
      {"write \xff\xff\xff\xff....", broken},
      {"reply \0\xff\xff\xff\xff\xff\xff\xff\xff"s,
       crashed + "sent a broken record over this message: "},
      {"reply \4", broken},
      {"reply \2\xff", broken},
      {"hello", broken},
      {"write \x09\0\0\x09;flood"s, broken + "not a valid status: 170", 3,
       true},  // the longest reply
      {"crash", crashed + "was killed by SIGABRT over this message", 3, false, TEST_SERVER},
      {"hang", late, 2},
      {"write \0\0\x40\0;drip"s, late, 2},  // a reply of megabytes, a byte at a time
      // Answers, then does what shows with the next request at the latest.
      {"answer 1;last", "1", 2},
      {"answer 1;answer 1", "1", 2},
      {"answer 1;id 1;answer 41", "1", 2},
      {"answer 1;write \x20\0\0\0;hang"s, "1", 2, true},
      {"stopReading;answer 1;hang", "1", 2, true},
  };
  for (const auto& row : rows) {
    const bool isLate = row.outcome == late;
    Client client(optionsFor(row.program, isLate ? 300ms : 20s));
    const auto expectOutcome = [&](const std::string& got) {
      EXPECT_EQ(got.substr(0, row.outcome.size()), row.outcome);
    };
    const auto start = Clock::now();
    expectOutcome(outcome(client, row.message));
    std::this_thread::sleep_for(5ms);  // what nobody asked for arrives
    EXPECT_EQ(outcome(client, "answer 2"), "2") << row.message;
    EXPECT_EQ(client.stats().started, row.started) << row.message;
    EXPECT_LT(Clock::now() - start, 10s) << row.message << " waited for a deadline";
    if (row.isAlone) continue;
    Loop loop(optionsFor(row.program, isLate ? 300ms : 20s));  // sends all at once
    for (int i = 0; i < 20; ++i) loop.submit("answer 3");
    loop.submit(row.program == TEST_SERVER ? "crash" : "exit 3");
    loop.submit(row.message);
    for (int i = 0; i < 8; ++i) loop.submit(isLate ? "sleep 50;answer 4" : "answer 4");
    const auto outcomes = loop.run(30);
    EXPECT_EQ(outcomes[20].substr(0, 8), "crashed:") << row.message;
    expectOutcome(outcomes[21]);
    for (int i = 0; i < 20; ++i) EXPECT_EQ(outcomes[i], "3") << row.message;
    for (int i = 22; i < 30; ++i) EXPECT_EQ(outcomes[i], "4") << row.message;
  }
}

TEST_F(ClientTest, IsUnavailableWithoutAUsableService) {
  const struct {
    std::string program;
    std::string outcome;
  } rows[] = {
      {"/nonexistent/service", "cannot start /nonexistent/service: No such file or directory"},
      {"/", "cannot start /: Permission denied"},
      {"/bin/ls", "/bin/ls is unusable: "},
      {starting("exit 5"), "exit 5 exited with status 5 before its hello"},
      {starting("exit 65"), "part of its sandbox: no new privileges) before its hello"},
      {starting("hello unsandboxed"), "is unusable: its sandbox lacks: "},
      {starting("hello smaller"), "is unusable: its limits differ"},
      {starting("write \xff\xff\xff\xff"), "is unusable: "},
      {starting("hello;write \xff\xff\xff\xff"), "the service sent a broken frame"},
      {starting("hello;exit 0"), "the service exited with status 0 "},
      // A long message is sent from where it is: a reply before its end would release it.
      {starting("hello;head;answer 1;hang"), "the service sent a broken frame"},
      {starting("hang"), "hang sent no hello before the start deadline"},
  };
  for (const auto& row : rows) {
    Client client(optionsFor(row.program, 2s));
    const std::string message = "answer 2" + std::string(std::size_t{1} << 20, ' ');
    const auto start = Clock::now();
    Pending first = submit(client, message);
    for (const std::string& got : {outcome(client, message), outcome(first)}) {
      EXPECT_TRUE(got.starts_with("unavailable: ") || row.outcome.starts_with("the")) << got;
      EXPECT_NE(got.find(row.outcome), std::string::npos) << got;
    }
    EXPECT_LE(client.stats().started, 10U) << row.program;
    const bool isTriedAgain = row.outcome.find("before its hello") != std::string::npos;
    EXPECT_TRUE(!isTriedAgain || Clock::now() - start >= 150ms) << "five starts";
  }
}

TEST_F(ClientTest, ReplacesAnOldProcessOnlyByAUsableOne) {
  for (const std::string successor : {FAKE_SERVICE, "/bin/false", "/bin/ls", "/bin/cat", "/none"}) {
    Client::Options old = fake();
    old.program = starting("hello");
    old.requestsPerProcess = 2;
    Client client(old);
    Loop loop(old);
    for (std::size_t i = 1; i <= 20; ++i) {
      loop.submit("answer 1");
      EXPECT_EQ(loop.run(i)[i - 1], "1") << successor;
      EXPECT_EQ(outcome(client, "answer 1"), "1") << successor;
      if (i == 1) old.program = link("hello", successor);
      std::this_thread::sleep_for(2ms);
    }
    const bool isUsable = successor == FAKE_SERVICE;
    for (const Stats& stats : {client.stats(), loop.client.stats()}) {
      EXPECT_EQ(stats.retired > 2, isUsable) << successor;
      EXPECT_EQ(stats.started > 1, isUsable) << successor;
      EXPECT_EQ(stats.retried, 0U);
    }
  }
}

TEST_F(ClientTest, ReplacesAProcessThatIsSlowOrSeldomUsed) {
  Client slow(fake(200ms));
  for (int i = 0; i < 3; ++i) EXPECT_EQ(outcome(slow, "sleep 110;answer 1"), "1");
  for (int i = 0; i < 50 && slow.stats().retired == 0; ++i) {
    std::this_thread::sleep_for(1ms);
    EXPECT_EQ(outcome(slow, "answer 1"), "1");
  }
  EXPECT_EQ(slow.stats().retired, 1U) << "answers just in time, again and again";

  Client::Options old = optionsFor(starting("sleep 50;hello"), 1s);
  old.requestsPerProcess = 1;
  Client client(old);
  EXPECT_EQ(outcome(client, "answer 1"), "1");
  std::this_thread::sleep_for(2100ms);  // longer than a start may take
  EXPECT_EQ(outcome(client, "answer 2"), "2");
  EXPECT_EQ(client.stats().retired, 1U);
}

TEST_F(ClientTest, RunsAsManyProcessesAsAreBusyUpToTheLimit) {
  Client::Options all = fake();
  all.processes = 3;
  all.idleTime = 500ms;
  Client client(all);
  for (int i = 0; i < 5; ++i) EXPECT_EQ(outcome(client, "answer 1"), "1");
  EXPECT_EQ(client.stats().started, 1U) << "one caller at a time";
  const auto start = Clock::now();
  inThreads(6, [&](int) { EXPECT_EQ(outcome(client, "sleep 50;answer 1"), "1"); });
  EXPECT_GE(Clock::now() - start, 100ms);
  inThreads(6, [&](int) { EXPECT_EQ(outcome(client, "sleep 5;answer 1"), "1"); });
  EXPECT_EQ(client.stats().started, 3U);
  std::this_thread::sleep_for(500ms);
  for (int i = 0; i < 5; ++i) EXPECT_EQ(outcome(client, "answer 1"), "1");
  EXPECT_EQ(client.stats().started - client.stats().ended, 1U) << "idle ones have been ended";
}

TEST_F(ClientTest, ServesCallersInTheirOrder) {
  Client::Options all = fake();
  all.processes = 1;
  all.maxBytesInFlight = 10000;
  for (const bool submits : {false, true}) {
    Client client(all);
    std::mutex mutex;
    std::vector<int> order;
    const auto start = Clock::now();
    inThreads(4, [&](int i) {
      while (client.stats().inFlight < static_cast<unsigned>(i)) std::this_thread::sleep_for(1ms);
      std::this_thread::sleep_for(30ms);  // the one before is queued
      const std::string message = i == 0 ? "sleep 250;answer 1;" + std::string(20000, ' ')
                                         : "sleep 30;answer 1;" + std::string(6000, ' ');
      Pending pending;
      if (submits) {
        pending = submit(client, message);
      } else {
        EXPECT_EQ(outcome(client, message), "1");
      }
      EXPECT_TRUE(i == 0 || Clock::now() - start >= 250ms) << "the first holds it up";
      const std::lock_guard lock(mutex);
      order.push_back(i);
      if (submits) pending.wait();
    });
    EXPECT_EQ(order, (std::vector<int>{0, 1, 2, 3}));
  }
}

TEST_F(ClientTest, DoesNotHoldUpSmallRequestsBehindSlowOrLargeOnes) {
  Client::Options all = fake();
  all.processes = 2;
  Loop loop(all);
  loop.submit("sleep 400;answer 1");
  loop.submit("sleep 5;answer 1;" + std::string(std::size_t{1} << 20, ' '));
  for (int i = 0; i < 20; ++i) loop.submit("answer 1");
  EXPECT_EQ(loop.run(21)[0], "") << "the slow one is the last";
  EXPECT_EQ(loop.run(22)[0], "1");
  loop.submit("sleep 400;answer 1");
  loop.submit("answer 2");
  EXPECT_EQ(loop.run(23)[23], "2") << "alone behind a slow one";
}

TEST_F(ClientTest, SleepsWhileItWaits) {
  Client::Options all = fake();
  all.processes = 1;
  all.idleTime = 0ms;
  Client client(all);
  Loop loop(all);
  loop.submit("answer 0");
  loop.run(1);
  const std::clock_t before = std::clock();  // of all threads, while they run
  loop.submit("sleep 200;answer 1");
  for (int i = 0; i < 5; ++i) loop.submit("answer 1");
  loop.client.dispatch();
  std::this_thread::sleep_for(30ms);
  loop.submit("answer 1");  // is held back
  loop.client.dispatch();
  pollfd ready = {loop.client.fd(), POLLIN, 0};
  EXPECT_EQ(::poll(&ready, 1, 50), 0);
  EXPECT_GT(loop.client.timeout(), 1000) << "nothing to do before the slow one has its reply";
  loop.run(8);
  EXPECT_EQ(outcome(client, "sleep 200;answer 1"), "1");
  Pending pending = submit(client, "sleep 200;answer 1");
  EXPECT_EQ(outcome(pending), "1");
  EXPECT_LT(std::clock() - before, CLOCKS_PER_SEC / 8);
  EXPECT_EQ(client.stats().started + loop.client.stats().started, 3U) << "the last stays";
}

TEST_F(ClientTest, HoldsRecordsUpToTheLimit) {
  Client::Options all = fake();
  all.maxBytesHeld = 1;
  Client client(all);
  for (const bool taken : {true, false}) {
    auto pending = submitAll(client, "answer 1", 2);
    pending[1].wait();
    EXPECT_GT(client.stats().bytesHeld, 1U) << "the only one";
    EXPECT_EQ(outcome(pending[1]), "out of memory");
    if (taken) {
      EXPECT_EQ(outcome(pending[0]), "1");
    }
    pending.clear();
    EXPECT_EQ(client.stats().bytesHeld, 0U);
  }
}

TEST_F(ClientTest, ReportsEveryLostProcess) {
  Client::Options all = fake(100ms);
  std::vector<std::string> losses;
  all.onProcessLost = [&](std::string_view why) { losses.emplace_back(why); };
  Client client(all);
  for (const char* message : {"exit 3", "hang", "answer 1"}) outcome(client, message);
  EXPECT_EQ(losses, (std::vector<std::string>{"exited with status 3", "exited with status 3",
                                              "no reply within 100 ms"}));
}

TEST_F(ClientTest, CompletesRequestsWhicheverThreadWaits) {
  Client::Options all = fake();
  all.maxBytesInFlight = 3000;
  auto client = std::make_unique<Client>(all);
  auto unheard = submitAll(*client, "answer 1", 50);  // beyond the room: the client reads
  Pending first = submit(*client, "sleep 10;answer 1");
  Pending second = submit(*client, "sleep 10;answer 1");
  EXPECT_EQ(first.wait_for(std::chrono::hours::max()), std::future_status::ready);
  EXPECT_EQ(second.wait_until(std::chrono::sys_seconds::max()), std::future_status::ready);
  Pending slow = submit(*client, "sleep 100;answer 1");
  EXPECT_EQ(slow.wait_for(1ms), std::future_status::timeout);
  EXPECT_EQ(slow.wait_for(std::chrono::hours::min()), std::future_status::timeout);
  EXPECT_EQ(slow.wait_until(std::chrono::system_clock::time_point::min()),
            std::future_status::timeout);
  while (slow.wait_for(0s) != std::future_status::ready) {
  }
  EXPECT_EQ(outcome(slow), "1");
  EXPECT_FALSE(slow.valid());
  inThreads(4, [&](int i) {
    auto own = submitAll(*client, "answer 1", 20);
    Pending last = submit(*client, "sleep 20;answer 2");
    static_cast<void>(last.wait_for(i * 1ms));
    EXPECT_EQ(outcome(last), "2");
    expectAll(own, "1");
  });
  const auto accepted = client->stats().accepted;
  auto unasked = submitAll(*client, "answer 1", 1);
  while (client->stats().accepted == accepted) std::this_thread::sleep_for(1ms);
  auto waiting = submitAll(*client, "hang", 3);
  {
    std::vector<std::jthread> late;
    for (Pending& each : waiting) late.emplace_back([&] { EXPECT_EQ(outcome(each), kDestroyed); });
    std::this_thread::sleep_for(20ms);
    client.reset();
  }
  expectAll(unheard, "1");
}

TEST_F(ClientTest, OutlivesThreadsThatAreCancelled) {
  Client::Options all = fake();
  all.maxBytesInFlight = 1200;
  Client client(all);
  EXPECT_EQ(outcome(client, "answer 1"), "1");
  Pending slow = submit(client, "sleep 100;answer 1");
  Pending other = submit(client, "answer 2");
  const auto cancel = [](std::function<void()> call) {
    pthread_t thread{};
    const auto run = [](void* argument) -> void* {
      (*static_cast<std::function<void()>*>(argument))();
      return nullptr;
    };
    ASSERT_EQ(::pthread_create(&thread, nullptr, run, &call), 0);
    std::this_thread::sleep_for(20ms);
    ::pthread_cancel(thread);
    ::pthread_join(thread, nullptr);
  };
  cancel([&] { submit(client, "answer 3"); });  // waits for room
  slow = submit(client, "sleep 100;answer 1");
  cancel([&] { slow.wait(); });  // reads
  EXPECT_EQ(outcome(other), "2");
  EXPECT_EQ(outcome(slow), "1");
  EXPECT_EQ(outcome(client, "answer 4"), "4");
}

TEST_F(ClientTest, FailsWhatIsInFlightWhenItEnds) {
  auto client = std::make_unique<Client>(fake());
  Pending pending = submit(*client, "hang");
  std::string outcomes;
  client->submit<VeskCommandResponse>(Data("hang"), [&, ending = client.get()](const Outcome&) {
    ending->submit<VeskCommandResponse>(
        Data("answer 1"), [&](const Outcome& outcome) { outcomes += inWords(outcome); });
    EXPECT_EQ(outcomes, kDestroyed);
  });
  std::this_thread::sleep_for(20ms);
  client.reset();
  EXPECT_EQ(outcomes, kDestroyed);
  expectNoLeak();  // though `pending` lives
  EXPECT_EQ(outcome(pending), kDestroyed);
}

TEST_F(ClientTest, CancelsARequestOfALoop) {
  Loop loop(fake());
  loop.submit("sleep 50;answer 1");
  const auto inFlight = loop.submit("hang");
  loop.client.dispatch();
  const auto unsent = loop.submit("hang");
  EXPECT_TRUE(loop.client.cancel(unsent));
  loop.run(1);
  EXPECT_TRUE(loop.client.cancel(inFlight));
  loop.submit("answer 7");
  const auto done = loop.submit("answer 8");
  const auto outcomes = loop.run(3);
  EXPECT_EQ(outcomes[1] + outcomes[2], "");
  EXPECT_EQ(outcomes[3] + outcomes[4], "78");
  EXPECT_FALSE(loop.client.cancel(done));
  EXPECT_FALSE(loop.client.cancel(inFlight)) << "once is enough";
  bool cancelledItself = true;
  EventLoopClient::Handle own;
  own = loop.client.submit<VeskCommandResponse>(Data("answer 9"), [&](const Outcome&) {
    cancelledItself = loop.client.cancel(own);
    loop.submit("answer 10");
  });
  loop.submit("answer 11");
  loop.run(4);
  EXPECT_FALSE(cancelledItself);
  EXPECT_EQ(loop.client.stats().cancelled, 1U) << "the other has not been answered yet";

  const auto dying = loop.submit("sleep 20;exit 1");
  loop.client.dispatch();
  EXPECT_TRUE(loop.client.cancel(dying));
  while (loop.client.stats().cancelled == 1) loop.client.dispatch();
  EXPECT_EQ(loop.client.stats().retried, 0U);
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

TEST_F(ClientTest, WorksInADaemonThatReapsItsOwnChildren) {
  for (const auto handler : {SIG_IGN, reapAll}) {
    const auto before = ::signal(SIGCHLD, handler);
    {
      Client client(fake());
      EXPECT_EQ(outcome(client, "answer 1"), "1");
      EXPECT_EQ(outcome(client, "exit 3").substr(0, 8), "crashed:");
      EXPECT_EQ(outcome(client, "answer 2"), "2");
    }
    ::signal(SIGCHLD, before);
  }
}

/// Runs `act` in a forked child, `meanwhile` in this process. Whether `act` returned true.
bool holdsInChild(const std::function<bool()>& act, const std::function<void()>& meanwhile) {
  int done[2];
  EXPECT_EQ(::pipe(done), 0);
  const pid_t child = ::fork();
  if (child == 0) {
    ::alarm(30);
    const bool holds = act();
    char byte = 0;
    // Lives on with copies of the client's descriptors until the parent is ready.
    std::_Exit(::read(done[0], &byte, 1) == 1 && holds ? 0 : 1);
  }
  meanwhile();
  EXPECT_EQ(::write(done[1], "x", 1), 1);
  int status = -1;
  EXPECT_EQ(::waitpid(child, &status, 0), child);
  for (const int end : done) ::close(end);
  return status == 0;
}

TEST_F(ClientTest, BelongsToTheProcessThatForked) {
  auto client = std::make_unique<Client>(fake());
  EXPECT_EQ(outcome(*client, "answer 1"), "1");
  Pending begun = submit(*client, "sleep 100;answer 1");
  Loop loop(fake());
  loop.submit("answer 1");  // never sent
  const auto refuses = [&] {
    const bool refused = outcome(*client, "answer 2").starts_with("unavailable: ") &&
                         outcome(begun).starts_with("unavailable: ") && loop.client.timeout() == -1;
    client.reset();
    return refused;
  };
  EXPECT_TRUE(holdsInChild(refuses, [&] {
    EXPECT_EQ(outcome(begun), "1");
    EXPECT_EQ(outcome(*client, "exit 1").substr(0, 8), "crashed:");
    EXPECT_EQ(outcome(*client, "answer 4"), "4");
    client.reset();
  }));
}

/// The processes that root started cannot be signalled by the user that the daemon becomes.
TEST_F(ClientTest, EndsItsServiceAfterTheDaemonDroppedItsPrivileges) {
  if (::geteuid() != 0) GTEST_SKIP() << "needs privileges to drop";
  const auto usesService = [] {
    auto client = std::make_unique<Client>(optionsFor(TEST_SERVER, 300ms));
    const bool served = outcome(*client, "tell 1") == "1" && ::setgid(65534) == 0 &&
                        ::setuid(65534) == 0 &&
                        outcome(*client, "stall") == "timedOut: no reply within 300 ms";
    client.reset();
    return served && ::waitpid(-1, nullptr, WNOHANG) == -1;
  };
  EXPECT_TRUE(holdsInChild(usesService, [] {}));
}

}  // namespace
}  // namespace ironmoat::testing
