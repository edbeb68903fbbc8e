#pragma once

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <filesystem>
#include <iterator>
#include <thread>

namespace ironmoat::testing {

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
