// Target: a client's channel. Each byte is an event of ChannelGame: a request, or a service that
// answers, lies, dies or stalls. ChannelGame checks the channel's promises. (S15)

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <string_view>

#include "channel_game.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::string_view kEvents = "00001234444455667788889abcdefghijklmnopqrstuvwxyzABCDEFG-";
  constexpr std::size_t kMaxEvents = 300;
  ironmoat::testing::ChannelGame game;
  try {
    for (std::size_t i = 0; i < std::min(size, kMaxEvents); ++i) {
      game.play(kEvents[data[i] % kEvents.size()]);
    }
    game.finish();
  } catch (const std::exception&) {
    std::abort();
  }
  return 0;
}
