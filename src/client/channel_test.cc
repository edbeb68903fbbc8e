// Channel by events alone: no process, no socket, no clock.

#include "client/channel.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>

#include "client/record_request.h"
#include "ironmoat/command_response.h"
#include "support/channel_game.h"

namespace ironmoat {
namespace {

using testing::ChannelGame;

TEST(Channel, GivesEachOrderOfEventsItsOutcomes) {
  const struct {
    std::string_view what;
    std::string_view events;
    std::string_view outcomes;
    std::string_view given;
  } rows[] = {
      {"replies in order", "abc0444", "a record, b record, c record", "abc"},
      {"death under the first request", "a0604", "a record", "a|a"},
      {"two deaths", "a0606", "a crashed", "a|a"},
      {"a retry that another request preceded is no proof", "ab0604604", "a record, b record",
       "ab|ab|b"},
      {"all in flight go alone", "abc0604444", "a record, b record, c record", "abc|abc"},
      {"the culprit among others", "abc0604606044", "a record, b crashed, c record", "abc|ab|b|c"},
      {"unsent requests are no suspects", "a0886b04b4", "a record, b record", "a|ab"},
      {"violation", "a0505", "a crashed", "a|a"},
      {"deadline of a request alone", "a07", "a timedOut", "a"},
      {"deadline of a request among others", "ab07070444", "a timedOut, b record", "ab|a|b"},
      {"deadline while the process is replaced", "a067", "a timedOut", "a"},
      {"deadline of the second in flight", "ab0470444", "a record, b timedOut", "ab"},
      {"no hello", "a17", "a unavailable", ""},
      {"death before the hello", "a1616161616", "a unavailable", ""},
      {"starts fail for now", "a2222b2", "a unavailable, b unavailable", ""},
      {"four starts fail", "a222204", "a record", "a"},
      {"a start fails for good", "ab3", "a unavailable, b unavailable", ""},
      {"cancelled before it is sent", "aAb044", "a, b record", "ab"},
      {"cancelled in flight", "ab0A44", "a, b record", "ab"},
      {"cancelled, then death", "ab0A6044", "a, b record", "ab|b"},
      {"a process that is let go", "a049b04", "a record, b record", "a|b"},
  };
  for (const auto& row : rows) {
    ChannelGame game;
    game.play(row.events);
    EXPECT_EQ(game.outcomes(), row.outcomes) << row.what;
    EXPECT_EQ(game.given(), row.given) << row.what;
  }
}

/// Every sequence of events of this length, for up to three requests: the game checks the promises.
TEST(Channel, KeepsItsPromisesInEveryOrderOfEvents) {
  const struct {
    std::string_view start;
    std::string_view events;
    int length;
  } spaces[] = {
      {"a", "0245678A9", 5}, {"ab", "045678AB", 6}, {"abc", "0467AB", 7}, {"abc0", "467C0d", 6}};
  for (const auto& space : spaces) {
    std::string events(static_cast<std::size_t>(space.length), space.events[0]);
    for (bool more = true; more;) {
      try {
        ChannelGame game;
        game.play(space.start);
        game.play(events);
        game.finish();
      } catch (const std::logic_error& error) {
        FAIL() << space.start << events << ": " << error.what();
      }
      more = false;
      for (char& event : events) {
        const std::size_t next = space.events.find(event) + 1;
        event = space.events[next % space.events.size()];
        if (next < space.events.size()) {
          more = true;
          break;
        }
      }
    }
  }
}

/// Three requests, each good, deadly or endless, and replies that a death takes with it or not.
TEST(Channel, FailsExactlyTheCulprits) {
  for (int natures = 0; natures < 27; ++natures) {
    for (const bool repliesAreLost : {false, true}) {
      const int of[] = {natures % 3, natures / 3 % 3, natures / 9};
      ChannelGame game;
      game.play("abc0");
      std::string expected;
      for (int i = 0; i < 3; ++i) {
        expected += std::string(i == 0 ? "" : ", ") + static_cast<char>('a' + i) +
                    (of[i] == 0   ? " record"
                     : of[i] == 1 ? " crashed"
                                  : " timedOut");
      }
      for (int steps = 0; steps < 100 && game.outcomes() != expected; ++steps) {
        const std::string has = game.unanswered();
        if (has.empty()) {
          game.play('0');
          continue;
        }
        std::size_t good = 0;
        while (good < has.size() && of[has[good] - 'a'] == 0) ++good;
        if (!repliesAreLost || good == has.size()) game.play(std::string(good, '4'));
        if (good < has.size()) game.play(of[has[good] - 'a'] == 1 ? '6' : '7');
      }
      EXPECT_EQ(game.outcomes(), expected);
    }
  }
}

/// A long message is sent from where it is: completing its request would release it.
TEST(Channel, RejectsAReplyToARequestThatIsNotWhollySent) {
  const auto now = client::Clock::now();
  client::Counters counters;
  client::Channel channel(std::chrono::seconds(2), counters);
  const auto request = std::make_shared<client::RecordRequest<VeskCommandResponse>>(
      counters, Data(std::string(100'000, 'x')), std::chrono::seconds(1));
  const auto body = [](BlockBuilder& frame) {
    return Data(std::string_view(frame.bytes(), frame.size()).substr(frames::kLengthBytes));
  };
  channel.add({request}, now);
  channel.started(now);
  frames::Hello hello = frames::Hello::ours();
  hello.sandbox = sandbox::kRequiredParts;
  BlockBuilder greeting;
  frames::appendHello(greeting, hello);
  channel.receive(body(greeting), now);

  const auto parts = channel.output();
  ASSERT_GT(parts[1].iov_len, 0U);
  std::uint64_t id = 0;
  std::memcpy(&id, static_cast<const char*>(parts[0].iov_base) + frames::kLengthBytes, sizeof id);
  BlockBuilder reply;
  frames::appendDescription(reply, id, frames::Status::notServed, "too early");
  channel.sent(parts[0].iov_len);
  EXPECT_THROW(channel.receive(body(reply), now), frames::FrameError);
  EXPECT_FALSE(request->isDone());
  channel.sent(parts[1].iov_len);
  channel.receive(body(reply), now);
  EXPECT_TRUE(request->isDone());
}

}  // namespace
}  // namespace ironmoat
