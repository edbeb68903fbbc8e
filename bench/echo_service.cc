// A stand-in for a service that unpacks in no time: it enters the same sandbox, waits and reads
// requests by the same code, and answers each with the reply to a typical message.

#include <fcntl.h>
#include <sys/select.h>
#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <optional>
#include <span>
#include <string>

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "frames/record_codec.h"
#include "frames/spin.h"
#include "messages.h"
#include "sandbox/memory.h"
#include "sandbox/sandbox.h"
#include "unpackers/corvel_payload_unpacker.h"

namespace {

using namespace ironmoat;

// Waits until the non-blocking descriptor is ready, by a call that the sandbox allows.
void waitFor(int descriptor, bool toRead) {
  fd_set only;
  FD_ZERO(&only);
  FD_SET(descriptor, &only);
  ::pselect(descriptor + 1, toRead ? &only : nullptr, toRead ? nullptr : &only, nullptr, nullptr,
            nullptr);
}

bool writeAll(std::string_view bytes) {
  while (!bytes.empty()) {
    const iovec piece = {const_cast<char*>(bytes.data()), bytes.size()};
    const ssize_t count = ::writev(STDOUT_FILENO, &piece, 1);
    if (count < 0 && errno == EAGAIN) {
      waitFor(STDOUT_FILENO, false);
      continue;
    }
    if (count <= 0) return false;
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
  return true;
}

ssize_t readSome(std::span<char> room) {
  static frames::Spin spin;  // as the service does
  ssize_t count = -1;
  const auto look = [&] {
    count = ::read(STDIN_FILENO, room.data(), room.size());
    return count >= 0;
  };
  while (!look() && !spin(look)) waitFor(STDIN_FILENO, true);
  return count;
}

}  // namespace

int main() {
  std::signal(SIGPIPE, SIG_IGN);
  ::fcntl(STDIN_FILENO, F_SETFL, O_NONBLOCK);
  sandbox::prepareMemory();
  BlockBuilder body;
  frames::encodeRecord(VeskCorvelPayloadUnpacker().unpack(
                           bench::messageOf(bench::typicalPayload(0), plist::Format::binary)),
                       body);
  BlockBuilder out;
  frames::FrameAssembler assembler(frames::kMaxRequestBody, Sharing::oneThread);
  frames::Hello hello = frames::Hello::ours();
  hello.sandbox = sandbox::enter();  // the filter is part of the cost of each call
  frames::appendHello(out, hello);
  while (writeAll({out.bytes(), out.size()})) {
    out.truncate(0);
    std::optional<Data> request = assembler.next();
    while (!request) {
      const std::span<char> room = assembler.room();
      const ssize_t count = readSome(room);
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
