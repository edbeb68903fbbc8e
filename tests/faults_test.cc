// A client and a sandboxed service through everything that can happen to the service. By default in
// seconds; `faults_test --full` takes the sizes and prints the figures of doc/attacks.md. (S15,
// S16)

#include <sys/prctl.h>
#include <sys/syscall.h>

#include <map>
#include <random>
#include <string_view>

#include "support/fault_load.h"

namespace ironmoat::testing {
namespace {

Clock::duration timeOfFirstReply() {
  Client client(optionsFor(SERVICE));
  const auto start = Clock::now();
  EXPECT_EQ(client.unpack<VeskCommandResponse>(message(1)).command, 1);
  return Clock::now() - start;
}

/// Each run with `--gtest_repeat` kills at other times: ten with `--full` are 100,000 kills.
TEST_F(FaultsTest, KilledAtRandomTimesUnderLoad) {
  const auto spell = 4 * std::min({timeOfFirstReply(), timeOfFirstReply(), timeOfFirstReply()});
  Client client(optionsFor(SERVICE));
  Killer kill;
  const auto unpack = [&] {
    const auto outcome = client.tryUnpack<VeskCommandResponse>(message(2));
    EXPECT_TRUE(outcome && outcome->command == 2)
        << (outcome.serviceError() != nullptr ? outcome.serviceError()->what() : "another outcome");
  };
  Times alone;
  for (int i = sized(20, 1000); i > 0; --i) {
    unpack();
    EXPECT_TRUE(kill());
    alone.measure(unpack);
  }
  alone.print("kill to the reply to the next request");

  Load load(client, 4);
  Times loaded;
  static std::mt19937 random(1);
  const int most = sized(200, 10'000);
  for (int kills = 0; kills < most;) {
    std::this_thread::sleep_for(spell * (random() % 1000) / 1000);
    if (!kill()) continue;
    // After the others a process that replaces one may be killed while it starts.
    if (++kills % 2 == 0) loaded.measure(unpack);
  }
  loaded.print("the same under load");
  const Tally& tally = load.stop();
  std::printf("%d kills: %d right, %d crashed, %d unavailable, %d wrong\n", most,
              tally.right.load(), tally.crashed.load(), tally.unavailable.load(),
              tally.wrong.load());
  EXPECT_EQ(tally.wrong, 0);
  EXPECT_GT(tally.right, most);
  EXPECT_LE(tally.crashed, most) << "at most one for each death";
}

/// The processes that root started cannot be signalled by the user that the daemon becomes.
TEST_F(FaultsTest, PrivilegesAreDropped) {
  if (::geteuid() != 0) GTEST_SKIP() << "needs privileges to drop";
  const pid_t child = ::fork();
  if (child == 0) {
    ::alarm(30);
    auto client = std::make_unique<Client>(optionsFor(TEST_SERVER, 500ms));
    const auto says = [&](const char* message) {
      const auto outcome = client->tryUnpack<VeskCommandResponse>(Data(std::string(message)));
      return outcome ? "a record" : std::string(outcome.serviceError()->what());
    };
    bool right = says("tell 1") == "a record" && ::setgid(65534) == 0 && ::setuid(65534) == 0;
    right = right && says("stall") == "no reply within 500 ms";
    client.reset();
    std::_Exit(right && ::waitpid(-1, nullptr, WNOHANG) == -1 ? 0 : 1);
  }
  int status = -1;
  EXPECT_EQ(::waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
}

TEST_F(FaultsTest, ClientsGoWithRequestsInFlight) {
  std::mt19937 random(1);
  Tally tally;
  Times times;
  for (int round = 0; round < sized(50, 1000); ++round) {
    std::vector<Pending> pending;
    auto client = std::make_unique<Client>(optionsFor(SERVICE));
    for (int i = 0; i < 300; ++i) {
      pending.push_back(client->submit<VeskCommandResponse>(message(i)));
    }
    std::this_thread::sleep_for(std::chrono::microseconds(random() % 6000));
    if (round % 3 == 0) Killer()();
    times.measure([&] { client.reset(); });
    for (int i = 0; i < 300; ++i) {
      EXPECT_EQ(pending[i].wait_for(0s), std::future_status::ready);
      tally.count(i, pending[i]);
    }
  }
  times.print("destruction with up to 300 in flight");
  EXPECT_EQ(tally.wrong, 0);
  EXPECT_GT(tally.right, 0);
  EXPECT_GT(tally.unavailable, 0);
}

TEST_F(FaultsTest, OtherThreadsForkChildrenThatLiveOn) {
  std::vector<pid_t> children;
  {
    Client client(optionsFor(SERVICE));
    Load load(client, 8);
    Killer kill;
    for (int i = 0; i < sized(50, 500); ++i) {
      std::this_thread::sleep_for(3ms);
      if (i % 3 == 0) kill();
      const pid_t child = ::fork();
      ASSERT_GE(child, 0);
      if (child == 0) {  // with copies of whatever descriptors there were
        ::prctl(PR_SET_PDEATHSIG, SIGKILL);
        for (;;) ::pause();
      }
      children.push_back(child);
    }
    EXPECT_EQ(load.stop().wrong, 0);
  }
  for (const pid_t child : children) {
    EXPECT_EQ(::waitpid(child, nullptr, WNOHANG), 0) << "lives";
    ::kill(child, SIGKILL);
    EXPECT_EQ(::waitpid(child, nullptr, 0), child);
  }
}

/// For the test server: what to do, and what is to come of it.
struct Poison {
  std::string verb;
  std::string outcome;
};

std::string outcomeOf(Pending& pending) {
  try {
    const VeskCommandResponse record = pending.get();
    return std::string(record.token ? record.token->view() : "no token");
  } catch (const ServiceError& error) {
    return std::string(nameOf(error.kind())) + ": " + error.what();
  } catch (const DecodingError& error) {
    return std::string(nameOf(error.kind()));
  }
}

TEST_F(FaultsTest, PoisonFailsAloneAmongAThousand) {
  constexpr auto kDeadline = sandbox::kSanitizedBuild ? 2000ms : 1000ms;
  const Poison crash = {"crash", "crashed: the service was killed by SIGABRT over this message"};
  const Poison stall = {"stall", "timedOut: no reply within " + std::to_string(kDeadline.count())};
  const Poison forbidden = {"forbidden",
                            "crashed: the service was killed by SIGSYS (forbidden system call " +
                                std::to_string(SYS_getppid) + " (getppid)) over this message"};
  const Poison large = {"hold 2000", "notEnoughMemory"};  // fails too, but harms nobody
  const std::vector<Poison> rounds[] = {
      {crash, crash, stall}, {stall, crash, stall}, {crash, forbidden, forbidden, large}};
  Client client(optionsFor(TEST_SERVER, kDeadline));
  std::mt19937 random(1);
  const int requests = sized(300, 1000);
  int failed = 0;
  const int count = sized(3, 100);
  for (int round = 0; round < count; ++round) {
    const auto& poisons = rounds[round % (sandbox::kSanitizedBuild ? 2 : 3)];
    std::map<int, Poison> at;
    for (const Poison& poison : poisons) {
      while (!at.try_emplace(static_cast<int>(random() % requests), poison).second) {
      }
    }
    std::vector<Pending> all;
    for (int i = 0; i < requests; ++i) {
      const auto poison = at.find(i);
      const std::string text =
          poison != at.end() ? poison->second.verb : "tell " + std::to_string(i);
      all.push_back(client.submit<VeskCommandResponse>(Data(text)));
    }
    for (int i = 0; i < requests; ++i) {
      const auto poison = at.find(i);
      const std::string expected =
          poison != at.end() ? poison->second.outcome : "tell " + std::to_string(i);
      const std::string outcome = outcomeOf(all[i]);
      EXPECT_EQ(poison != at.end() ? outcome.substr(0, expected.size()) : outcome, expected) << i;
      if (outcome.find(": ") != std::string::npos) ++failed;
    }
  }
  std::printf("%d times %d with three poisoned: %d failed\n", count, requests, failed);
  EXPECT_EQ(failed, 3 * count);
}

}  // namespace
}  // namespace ironmoat::testing

int main(int count, char** arguments) {
  ::testing::InitGoogleTest(&count, arguments);
  ironmoat::testing::fullSize = count > 1 && std::string_view(arguments[1]) == "--full";
  return RUN_ALL_TESTS();
}
