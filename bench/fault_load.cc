// A load on a client whose sandboxed services are killed. In seconds as a test; `faults_test
// --full` takes minutes and prints the figures of doc/attacks.md. (S15, S16)

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <deque>
#include <filesystem>
#include <fstream>
#include <memory>
#include <random>
#include <set>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "ironmoat/client.h"
#include "ironmoat/command_response.h"
#include "sandbox_parts/sandbox_parts.h"
#include "support/clients.h"

namespace ironmoat::testing {
namespace {

using Clock = std::chrono::steady_clock;
using FaultsTest = LeakCheck;

/// `--full` was given: minutes by hand instead of seconds in CI.
bool fullSize = false;
int sized(int usual, int full) {
  return fullSize ? full : sandbox::kSanitizedBuild ? std::max(usual / 5, 2) : usual;
}

/// Messages for the real service. One in eight is no property list; the others have the number for
/// their command and a token, sometimes one of many kilobytes.
bool isJunk(int number) { return number % 8 == 0; }
std::size_t tokenGroups(int number) {
  const auto n = static_cast<std::size_t>(number);
  return n % 50 == 1 ? 40'000 : n % 30;
}
Data message(int number) {
  if (isJunk(number)) return Data(std::string_view("junk"));
  std::string text = "<plist version=\"1.0\"><dict><key>c</key><integer>";
  text += std::to_string(number) + "</integer><key>t</key><data>";
  for (std::size_t i = tokenGroups(number); i > 0; --i) text += "AAAA";
  return Data(text + "</data></dict></plist>");
}

struct Tally {
  std::atomic<int> right = 0;  // the record, or the refusal, that this message is to get
  std::atomic<int> crashed = 0;
  std::atomic<int> unavailable = 0;
  std::atomic<int> wrong = 0;

  /// Counts the outcome of `number`. Only a SIGKILL and the client's end may be in the way.
  void count(int number, const Outcome& outcome) {
    if (const ServiceError* const error = outcome.serviceError()) {
      const std::string what = error->what();
      const bool killed = what.find("was killed by SIGKILL") != std::string::npos;
      if (killed && error->kind() == ServiceError::Kind::crashed) {
        ++crashed;
      } else if (what.ends_with("was killed by SIGKILL before its hello") ||
                 what.ends_with("was killed by SIGKILL before its first reply") ||
                 what == "the client was destroyed") {
        ++unavailable;
      } else {
        complain(what);
      }
    } else if (isJunk(number) ? outcome.decodingError() != nullptr
                              : outcome && outcome->command == number && outcome->token &&
                                    outcome->token->size() == 3 * tokenGroups(number)) {
      ++right;
    } else {
      complain(inWords(outcome));
    }
  }
  void count(int number, Pending& pending) {
    if (pending.wait_for(60s) != std::future_status::ready) return complain("hangs");
    count(number, pending.outcome());
  }

 private:
  void complain(const std::string& what) {
    if (++wrong <= 10) std::fprintf(stderr, "wrong outcome: %s\n", what.c_str());
  }
};

/// Threads that keep a client busy, waiting for some outcomes and not for others.
class Load {
 public:
  Load(Client& client, int threads) {
    for (int t = 0; t < threads; ++t) {
      threads_.emplace_back([this, &client, t, threads] {
        std::deque<std::pair<int, Pending>> pending;
        for (int number = t; !stop_; number += threads) {
          if (number / threads % 5 == 0) {
            tally_.count(number, client.tryUnpack<VeskCommandResponse>(message(number)));
          } else {
            pending.emplace_back(number, client.submit<VeskCommandResponse>(message(number)));
          }
          if (pending.size() == 16) takeOne(pending);
        }
        while (!pending.empty()) takeOne(pending);
      });
    }
  }
  ~Load() { stop(); }
  const Tally& stop() {
    stop_ = true;
    for (auto& thread : threads_) thread.join();
    threads_.clear();
    return tally_;
  }

 private:
  void takeOne(std::deque<std::pair<int, Pending>>& pending) {
    tally_.count(pending.front().first, pending.front().second);
    pending.pop_front();
  }

  Tally tally_;
  std::atomic<bool> stop_ = false;
  std::vector<std::thread> threads_;
};

/// The services that clients of this process run, whichever thread started them.
std::vector<pid_t> serviceProcesses() {
  std::vector<pid_t> all;
  for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
    std::ifstream children(task.path() / "children");
    for (pid_t pid = 0; children >> pid;) {
      std::string name;
      std::getline(std::ifstream("/proc/" + std::to_string(pid) + "/comm"), name);
      if (name == "VeskIronmoatSer" || name == "test_server") all.push_back(pid);
    }
  }
  return all;
}

/// Kills each process once; says whether there was one to kill.
class Killer {
 public:
  bool operator()() {
    const std::vector<pid_t> all = serviceProcesses();
    // Numbers are given again.
    std::erase_if(killed_, [&](pid_t pid) { return std::ranges::count(all, pid) == 0; });
    const auto next =
        std::find_if(all.begin(), all.end(), [this](pid_t pid) { return !killed_.contains(pid); });
    if (next == all.end()) return false;
    killed_.insert(*next);
    ::kill(*next, SIGKILL);
    return true;
  }

 private:
  std::set<pid_t> killed_;
};

class Times {
 public:
  void add(Clock::duration time) { all_.push_back(time); }
  template <class Act>
  void measure(Act act) {
    const auto start = Clock::now();
    act();
    add(Clock::now() - start);
  }
  void print(const std::string& what) {
    std::sort(all_.begin(), all_.end());
    const auto at = [&](std::size_t percent) {
      const auto time = all_[(all_.size() - 1) * percent / 100];
      return std::chrono::duration<double, std::micro>(time).count();
    };
    std::printf("%-48s p50 %8.1f us  p99 %8.1f us  most %8.1f us  of %zu\n", what.c_str(), at(50),
                at(99), at(100), all_.size());
  }

 private:
  std::vector<Clock::duration> all_;
};

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
    EXPECT_EQ(inWords(client.tryUnpack<VeskCommandResponse>(message(2))), "2");
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

}  // namespace
}  // namespace ironmoat::testing

int main(int count, char** arguments) {
  ::testing::InitGoogleTest(&count, arguments);
  ironmoat::testing::fullSize = count > 1 && std::string_view(arguments[1]) == "--full";
  return RUN_ALL_TESTS();
}
