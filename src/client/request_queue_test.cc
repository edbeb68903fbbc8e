#include "client/request_queue.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstring>
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
  /// A message for each letter; a capital stands for one that is sent from where it is.
  void push(std::string_view letters) {
    for (const char each : letters) queue_.push(std::make_unique<Silent>(message(each)), now_);
  }
  static std::string message(char letter) {
    std::string text(1, letter);
    while (letter < 'a' && text.size() <= RequestQueue::kWorthCopying) {
      text += std::to_string(text.size());
    }
    return text;
  }
  void restart() { queue_.restart(now_); }
  void finish(std::uint64_t id) {
    ASSERT_NE(queue_.owed(id), nullptr) << id;
    queue_.finish(id, now_);
  }

  /// Sends all that can be, `step` bytes at a time; returns ids and letters of what arrived whole.
  std::string send(std::size_t step = 1000) {
    std::array<iovec, 3> parts;
    std::string arrived;
    while (const std::size_t used = queue_.gather(parts)) {
      std::size_t count = 0;
      for (std::size_t i = 0; i < used; ++i) {
        const std::size_t taken = std::min(parts[i].iov_len, step - count);
        stream_.append(static_cast<const char*>(parts[i].iov_base), taken);
        count += taken;
      }
      queue_.sent(count);
      for (std::uint32_t length = 0; stream_.size() >= 4; stream_.erase(0, 4U + length)) {
        std::memcpy(&length, stream_.data(), 4);
        if (stream_.size() - 4 < length) break;
        const Data body(std::string_view(stream_).substr(4, length));
        const frames::Request request = frames::parseRequest(body);
        const char letter = request.message.view().front();
        EXPECT_EQ(request.message.view(), message(letter));
        arrived += std::to_string(request.id) + letter + " ";
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
  push("abCDef");
  EXPECT_EQ(send(), "") << "no process is ready";
  restart();
  std::array<iovec, 4> parts;
  queue_.gather(parts);
  queue_.sent(10);
  EXPECT_EQ(queue_.owed(1), nullptr);
  EXPECT_EQ(lose(), "a") << "begun, and nothing else was";
  restart();
  EXPECT_EQ(send(1), "2b 3C 4D 5e 6f ");
  push("GhiJ");
  EXPECT_EQ(send(2000), "7G 8h 9i 10J ");
  for (std::uint64_t id = 0; id < 9; ++id) EXPECT_EQ(queue_.owed(id) != nullptr, id > 1);
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
