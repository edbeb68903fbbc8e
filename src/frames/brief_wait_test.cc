#include "frames/brief_wait.h"

#include <gtest/gtest.h>

namespace ironmoat::frames {
namespace {

using namespace std::chrono_literals;

/// Counts looks and sleeps. What it waits for comes at look `comesAt` of a wait, each of which
/// takes `lookTime`.
class BriefWaitTest : public testing::Test {
 protected:
  void SetUp() override {
    if (std::thread::hardware_concurrency() < 2) GTEST_SKIP() << "never looks again";
  }

  void waitOnce(BriefWait& wait, int comesAt, BriefWait::Clock::duration lookTime,
                BriefWait::Clock::duration sleepTime) {
    looks_ = 0;
    const auto spend = [](auto time) {
      for (const auto end = BriefWait::Clock::now() + time; BriefWait::Clock::now() < end;) {
      }
    };
    wait(
        [&] {
          spend(lookTime);
          return ++looks_ == comesAt;
        },
        [&] {
          spend(sleepTime);
          ++sleeps_;
        });
  }

  int looks_ = 0;  // of the last wait
  int sleeps_ = 0;
};

TEST_F(BriefWaitTest, LooksAgainForAWhileOnlyWhereThePeerIsNear) {
  BriefWait wait(1ms);
  for (int i = 0; i < 3; ++i) waitOnce(wait, -1, 0us, 1ms);
  EXPECT_EQ(looks_, 1) << "it never came soon";
  for (int i = 0; i < 1000 && looks_ == 1; ++i) waitOnce(wait, -1, 0us, 0us);
  EXPECT_GT(looks_, 1) << "it came as soon as was slept for it";
  const int before = sleeps_;
  for (int i = 0; i < 20; ++i) waitOnce(wait, -1, 0us, 1ms);
  EXPECT_EQ(looks_, 1) << "it comes late again";
  EXPECT_EQ(sleeps_, before + 20);
}

TEST_F(BriefWaitTest, WhoIsHeldUpTwiceSleepsOnceAndNotAgainForAWhile) {
  BriefWait wait(10s);
  for (int before = -1; before != sleeps_; waitOnce(wait, 3, 5us, 0us)) before = sleeps_;
  sleeps_ = 0;
  // The last of these waits was held up, too.
  for (int i = 0; i < 2; ++i) waitOnce(wait, 3, 5us, 0us);
  EXPECT_EQ(sleeps_, 1);
  for (int i = 0; i < 30; ++i) waitOnce(wait, 3, 5us, 0us);
  EXPECT_EQ(sleeps_, 1);
  for (int i = 0; i < 4; ++i) waitOnce(wait, 3, 5us, 0us);
  EXPECT_EQ(sleeps_, 2);
}

}  // namespace
}  // namespace ironmoat::frames
