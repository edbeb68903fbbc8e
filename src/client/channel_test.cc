// Channel by events alone: no process, no socket, no clock.

#include "client/channel.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <string_view>

#include "channel_game.h"

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
      {"a request that shared its process has a new deadline", "ab0-60-44", "a record, b record",
       "ab|ab"},
      {"one that did not goes on with its first", "a0-60-", "a timedOut", "a|a"},
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
      {"six culprits in a row", "a0606b0606c0606d0606e0606f0606g04",
       "a crashed, b crashed, c crashed, d crashed, e crashed, f crashed, g record",
       "a|a|b|b|c|c|d|d|e|e|f|f|g"},
      {"a start fails for good, the next does not", "a3b04", "a unavailable, b record", "b"},
      {"a process that is let go", "a049b04", "a record, b record", "a|b"},
  };
  for (const auto& row : rows) {
    ChannelGame game;
    game.play(row.events);
    EXPECT_EQ(game.outcomes(), row.outcomes) << row.what;
    EXPECT_EQ(game.given(), row.given) << row.what;
  }
}

/// Every game of this length: the game checks the channel's promises.
TEST(Channel, KeepsItsPromisesInEveryShortGame) {
  const struct {
    std::string_view start;
    std::string_view events;
    int length;
  } spaces[] = {
      {"a", "0245678A9", 5}, {"ab", "045678AB", 6}, {"abc", "0467AB", 7}, {"abc0", "467C0d", 6}};
  for (const auto& [start, events, length] : spaces) {
    for (std::size_t game = 0, rest = 0; rest == 0; ++game) {
      std::string all(start);
      rest = game;
      for (int i = 0; i < length; ++i, rest /= events.size()) all += events[rest % events.size()];
      try {
        ChannelGame channel;
        channel.play(all);
        channel.finish();
      } catch (const std::logic_error& error) {
        FAIL() << all << ": " << error.what();
      }
    }
  }
}

}  // namespace
}  // namespace ironmoat
