// What the service would be if unpacking were free: as confined, reads requests through the same
// assembler and answers each with the reply that a typical message gets.

#include <sys/uio.h>
#include <unistd.h>

#include <csignal>
#include <cstring>
#include <optional>
#include <span>
#include <string>

#include "confinement/confinement.h"
#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "frames/record_codec.h"
#include "messages.h"
#include "unpackers/corvel_payload_unpacker.h"

namespace {

using namespace ironmoat;

bool writeAll(std::string_view bytes) {
  while (!bytes.empty()) {
    const iovec piece = {const_cast<char*>(bytes.data()), bytes.size()};
    const ssize_t count = ::writev(STDOUT_FILENO, &piece, 1);  // what confinement allows
    if (count <= 0) return false;
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
  return true;
}

}  // namespace

int main() {
  std::signal(SIGPIPE, SIG_IGN);
  confinement::prepareMemory();
  BlockBuilder body;
  frames::encodeRecord(VeskCorvelPayloadUnpacker().unpack(
                           bench::messageOf(bench::typicalPayload(0), plist::Form::binary)),
                       body);
  BlockBuilder out;
  frames::FrameAssembler assembler(frames::kMaxRequestBody, Sharing::oneThread);
  frames::Hello hello = frames::Hello::ours();
  hello.confinement = confinement::confine();  // its filter is part of what a call costs
  frames::appendHello(out, hello);
  while (writeAll({out.bytes(), out.size()})) {
    out.truncate(0);
    std::optional<Data> request = assembler.next();
    while (!request) {
      const std::span<char> room = assembler.room();
      const ssize_t count = ::read(STDIN_FILENO, room.data(), room.size());
      if (count <= 0) return 0;
      assembler.commit(static_cast<std::size_t>(count));
      request = assembler.next();
    }
    for (; request; request = assembler.next()) {
      const std::size_t start =
          frames::beginReply(out, frames::requestId(*request).value_or(0), frames::Status::record);
      out.append({body.bytes(), body.size()});
      frames::endReply(out, start);
    }
  }
}
