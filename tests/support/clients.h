#pragma once

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/wait.h>

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <iterator>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "ironmoat/client.h"
#include "ironmoat/command_response.h"
#include "ironmoat/event_loop_client.h"

/// What tests of clients share.
namespace ironmoat::testing {

using namespace std::chrono_literals;
using Outcome = ironmoat::Outcome<VeskCommandResponse>;
using Pending = ironmoat::Pending<VeskCommandResponse>;
using Deadline = Client::Deadline;

inline ClientOptions optionsFor(std::string program, std::chrono::milliseconds deadline = 20s) {
  ClientOptions options;
  options.program = std::move(program);
  options.deadline = deadline;
  return options;
}

/// The record's command, or the error: "crashed: ...", "typeMismatch at a[1]: ...".
inline std::string inWords(const Outcome& outcome) {
  if (outcome) return std::to_string(outcome->command);
  if (const auto* const error = outcome.serviceError()) {
    return std::string(nameOf(error->kind())) + ": " + error->what();
  }
  const auto* const error = outcome.decodingError();
  if (error == nullptr) return "out of memory";
  return std::string(nameOf(error->kind())) + " at " + error->path() + ": " + error->what();
}

inline Pending submit(Client& client, const std::string& message, Deadline deadline = {}) {
  return client.submit<VeskCommandResponse>(Data(message), deadline);
}
inline std::string outcome(Client& client, const std::string& message, Deadline deadline = {}) {
  return inWords(client.tryUnpack<VeskCommandResponse>(Data(message), deadline));
}
inline std::string outcome(Pending& pending) { return inWords(pending.outcome()); }

/// A loop around an EventLoopClient.
class Loop {
 public:
  explicit Loop(ClientOptions options) : client(std::move(options)) {}
  EventLoopClient::Handle submit(const std::string& message, Deadline deadline = {}) {
    outcomes_.emplace_back();
    const auto complete = [this, index = outcomes_.size() - 1](const Outcome& outcome) {
      outcomes_[index] = inWords(outcome);
      ++completed_;
    };
    return client.submit<VeskCommandResponse>(Data(message), complete, deadline);
  }
  /// Until `count` completions were called. Returns the outcomes in the order of the requests.
  const std::vector<std::string>& run(std::size_t count) {
    while (completed_ < count) {
      pollfd ready = {client.fd(), POLLIN, 0};
      ::poll(&ready, 1, client.timeout());
      client.dispatch();
    }
    return outcomes_;
  }

  EventLoopClient client;

 private:
  std::vector<std::string> outcomes_;
  std::size_t completed_ = 0;
};

/// Each test leaves descriptors, threads and children as they were.
class LeakCheck : public ::testing::Test {
 public:
  static void SetUpTestSuite() {
    std::thread([] {}).join();  // sanitizers start a thread of their own with the first
  }
  ~LeakCheck() override { expectNoLeak(); }

 protected:
  void expectNoLeak() const {
    EXPECT_EQ(entries("/proc/self/fd"), descriptors_);
    EXPECT_EQ(entries("/proc/self/task"), threads_);
    EXPECT_EQ(::waitpid(-1, nullptr, WNOHANG), -1) << "a child was left";
  }

 private:
  static std::ptrdiff_t entries(const char* folder) {
    const auto all = std::filesystem::directory_iterator(folder);
    return std::distance(begin(all), end(all));
  }

  std::ptrdiff_t descriptors_ = entries("/proc/self/fd");
  std::ptrdiff_t threads_ = entries("/proc/self/task");
};

}  // namespace ironmoat::testing
