// Reads request frames and writes the reply to each, without a sandbox: the answers of the service
// where it cannot sandbox itself, such as in an emulator.

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <iterator>
#include <string>
#include <string_view>

#include "frames/little_endian.h"
#include "host/server.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"
#include "values/block_builder.h"

int main() {
  using namespace ironmoat;
  IronmoatServer server(IronmoatServer::Sandboxed::no);
  server.registerUnpacker<DrelUserPayload>(VeskCorvelPayloadUnpacker());
  server.registerUnpacker<VeskCommandResponse>(VeskCommandResponseUnpacker());
  server.registerUnpacker<VeskCommandWebTunnelResponse>(VeskCommandWebTunnelResponseUnpacker());
  const std::string input(std::istreambuf_iterator<char>(std::cin), {});
  for (std::string_view rest = input; !rest.empty();) {
    const std::size_t end = 4 + frames::load<std::uint32_t>(rest.data());
    BlockBuilder reply;
    server.serve(Data(rest.substr(4, end - 4)), reply);
    std::cout.write(reply.bytes(), static_cast<std::streamsize>(reply.size()));
    rest.remove_prefix(end);
  }
  return std::cout.flush() ? EXIT_SUCCESS : EXIT_FAILURE;
}
