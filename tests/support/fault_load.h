#pragma once

#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <deque>
#include <filesystem>
#include <fstream>
#include <future>
#include <mutex>
#include <set>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "ironmoat/client.h"
#include "ironmoat/command_response.h"
#include "sandbox_parts/sandbox_parts.h"
#include "support/client_outcome.h"
#include "support/leak_check.h"

/// A client under load, a service that is killed, and what comes of it.
namespace ironmoat::testing {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

/// `--full` was given: minutes by hand instead of seconds in CI.
inline bool fullSize = false;
inline int sized(int usual, int full) {
  return fullSize ? full : sandbox::kSanitizedBuild ? std::max(usual / 5, 2) : usual;
}

using FaultsTest = LeakCheck;

/// Messages for the real service. One in eight is no property list; the others have the number for
/// their command and a token, sometimes one of many kilobytes.
inline bool isJunk(int number) { return number % 8 == 0; }
inline std::size_t tokenGroups(int number) {
  const auto n = static_cast<std::size_t>(number);
  return n % 50 == 1 ? 40'000 : n % 30;
}
inline Data message(int number) {
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

  /// Counts the one outcome of `number`. Only a SIGKILL and the client's end may be in the way.
  void count(int number, auto& pending) {
    if (pending.wait_for(60s) != std::future_status::ready) return complain("hangs");
    try {
      const VeskCommandResponse record = pending.get();
      const bool same = !isJunk(number) && record.command == number && record.token &&
                        record.token->size() == 3 * tokenGroups(number);
      return same ? void(++right) : complain("another record");
    } catch (const DecodingError& error) {
      return isJunk(number) ? void(++right) : complain(error.what());
    } catch (const ServiceError& error) {
      const std::string what = error.what();
      const bool killed = what.find("was killed by SIGKILL") != std::string::npos;
      if (killed && error.kind() == ServiceError::Kind::crashed) {
        ++crashed;
      } else if (what.ends_with("was killed by SIGKILL before its hello") ||
                 what.ends_with("was killed by SIGKILL before its first reply") ||
                 what == "the client was destroyed") {
        ++unavailable;
      } else {
        complain(what);
      }
    }
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
            std::promise<VeskCommandResponse> promise;
            try {
              promise.set_value(client.unpack<VeskCommandResponse>(message(number)));
            } catch (...) {
              promise.set_exception(std::current_exception());
            }
            std::future<VeskCommandResponse> outcome = promise.get_future();
            tally_.count(number, outcome);
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
inline std::vector<pid_t> serviceProcesses() {
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

}  // namespace ironmoat::testing
