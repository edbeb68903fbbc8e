// A sandboxed server whose unpacker obeys the message, a verb and an optional number: `hold N`
// allocates N MiB, `crash` aborts, `stall` never returns, and `forbidden` makes a forbidden system
// call. It answers any other message with the message as the token. The command is the number.

#include <unistd.h>

#include <charconv>
#include <cstdlib>
#include <memory>
#include <string_view>
#include <utility>

#include "host/server.h"
#include "ironmoat/command_response.h"

namespace {

using namespace ironmoat;

struct ObedientUnpacker {
  using MessageSchemaType = VeskCommandResponse;

  [[nodiscard]] VeskCommandResponse unpack(const Data& message) const {
    VeskCommandResponseArguments arguments;
    const std::string_view text = message.view();
    const std::string_view verb = text.substr(0, text.find(' '));
    if (verb.size() < text.size()) {
      const char* const number = text.data() + verb.size() + 1;
      std::from_chars(number, text.data() + text.size(), arguments.command);
    }
    if (verb == "hold") {
      const auto mebibytes = static_cast<std::size_t>(arguments.command);
      std::make_unique_for_overwrite<volatile char[]>(mebibytes << 20)[0] = 1;
    } else if (verb == "crash") {
      std::abort();
    } else if (verb == "stall") {
      for (volatile bool forever = true; forever;) {
      }
    } else if (verb == "forbidden") {
      static_cast<void>(::getppid());
    } else {
      arguments.token = message;
    }
    return VeskCommandResponse::with(std::move(arguments));
  }
};

}  // namespace

int main() {
  IronmoatServer server;
  server.registerUnpacker<VeskCommandResponse>(ObedientUnpacker());
  server.run();
  return 0;
}
