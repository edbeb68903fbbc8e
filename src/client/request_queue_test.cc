#include "client/request_queue.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <string>

namespace ironmoat::client {
namespace {

using namespace std::chrono_literals;

class Silent final : public Request {
 public:
  explicit Silent(std::string_view text) : Request("R", Data(text)) {}
  void give(const frames::Reply&) override {}
  void giveError(std::exception_ptr) noexcept override {}
};

/// A queue, a clock set by hand, and the receiving end of what is sent.
class RequestQueueTest : public testing::Test {
 protected:
  void push(std::string_view messages) {
    for (const char& m : messages)
      queue_.push(std::make_unique<Silent>(std::string_view(&m, 1)), now_);
  }
  void restart() { queue_.restart(now_); }
  void finish(std::uint64_t id) {
    ASSERT_NE(queue_.owed(id), nullptr) << id;
    queue_.finish(id, now_);
  }

  /// Sends all that can be, `step` bytes at a time; returns ids and messages of what arrived whole.
  std::string send(std::size_t step = 1000) {
    std::array<iovec, 8> parts;
    std::string arrived;
    while (const std::size_t used = queue_.gather(parts)) {
      std::size_t count = 0;
      for (std::size_t i = 0; i < used; ++i) {
        const std::size_t taken = std::min(parts[i].iov_len, step - count);
        stream_.append(static_cast<const char*>(parts[i].iov_base), taken);
        count += taken;
      }
      queue_.sent(count);
      while (!stream_.empty() && stream_.size() >= 4U + static_cast<unsigned char>(stream_[0])) {
        const Data body(std::string_view(stream_).substr(4, static_cast<std::size_t>(stream_[0])));
        const frames::Request request = frames::parseRequest(body);
        arrived += std::to_string(request.id) + std::string(request.message.view()) + " ";
        stream_.erase(0, 4 + body.size());
      }
    }
    return arrived;
  }

  /// The process dies; returns whom the queue blames.
  std::string lose() {
    const auto culprit = queue_.lose();
    return culprit == nullptr ? "nobody" : std::string(culprit->message().view());
  }

  /// When the front's time is up, in milliseconds; -1 while no clock runs.
  long expiry() {
    const auto at = queue_.expiry();
    return at ? static_cast<long>((*at - RequestQueue::TimePoint()) / 1ms) : -1;
  }

  RequestQueue queue_{100ms};
  RequestQueue::TimePoint now_{};
  std::string stream_;
};

TEST_F(RequestQueueTest, OnlyWhatWasWhollySentIsOwedHoweverItIsCut) {
  push("abcdef");
  EXPECT_EQ(send(), "") << "no process is ready";
  restart();
  std::array<iovec, 4> parts;
  queue_.gather(parts);
  queue_.sent(10);
  EXPECT_EQ(queue_.owed(1), nullptr);
  EXPECT_EQ(lose(), "a") << "begun, and nothing else was";
  restart();
  EXPECT_EQ(send(1), "2b 3c 4d 5e 6f ");
  for (std::uint64_t id = 0; id < 9; ++id) EXPECT_EQ(queue_.owed(id) != nullptr, id > 1 && id < 7);
}

TEST_F(RequestQueueTest, SuspectsAreTriedAloneUntilTheCulpritIsFound) {
  push("abcd");
  restart();
  EXPECT_EQ(send(3), "1a 2b 3c 4d ");
  finish(2);
  EXPECT_EQ(queue_.owed(2), nullptr) << "answered twice";
  EXPECT_EQ(lose(), "nobody");
  push("e");
  restart();
  EXPECT_EQ(send(), "1a ");
  finish(1);
  EXPECT_EQ(send(), "3c ");
  EXPECT_EQ(lose(), "nobody") << "the process had been given `a` before";
  restart();
  EXPECT_EQ(send(), "3c ");
  EXPECT_EQ(lose(), "c");
  restart();
  EXPECT_EQ(send(), "4d ");
  finish(4);
  push("f");
  EXPECT_EQ(send(), "5e 6f ") << "together again";
}

TEST_F(RequestQueueTest, AClockNeverRunsWhileItsRequestMayWaitForAnother) {
  push("a");
  EXPECT_EQ(expiry(), -1);
  restart();
  push("bcd");
  send();
  now_ += 50ms;
  finish(3);  // so `b` has been taken up
  EXPECT_EQ(expiry(), 100) << "a";
  now_ += 20ms;
  finish(1);
  EXPECT_EQ(expiry(), 150) << "b, since `c` was answered";
  finish(2);
  EXPECT_EQ(expiry(), 170) << "d, since it is alone";
  EXPECT_EQ(lose(), "nobody");
  EXPECT_EQ(expiry(), -1);
  now_ += 500ms;
  restart();
  EXPECT_EQ(expiry(), 670);
}

TEST_F(RequestQueueTest, AProcessIsGivenSoManyAtOnce) {
  push(std::string(RequestQueue::kWindow + 5, 'm'));
  restart();
  send();
  EXPECT_FALSE(queue_.hasUnsent());
  EXPECT_EQ(queue_.owed(RequestQueue::kWindow + 1), nullptr);
  finish(7);
  EXPECT_EQ(send(), std::to_string(RequestQueue::kWindow + 1) + "m ");
}

TEST_F(RequestQueueTest, WhatIsWorthSendingGrowsWithWhatIsOwed) {
  restart();
  std::size_t owed = 0;
  for (const std::size_t worth : {1, 1, 2, 4, 8, 16, 32, 32}) {
    for (std::size_t unsent = 1; unsent <= worth; ++unsent) {
      push("m");
      EXPECT_EQ(queue_.isWorthSending(), unsent == worth) << unsent << " for " << owed;
    }
    send();
    owed += worth;
  }
}

}  // namespace
}  // namespace ironmoat::client
