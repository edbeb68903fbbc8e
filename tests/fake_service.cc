// A service that does what each message tells it, for tests of the client: it answers, refuses,
// dies, hangs, lies. A message is a verb and a number; the record that answers it has the number as
// its `command`. How it starts depends on the name that it is run by.

#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <charconv>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <thread>
#include <utility>

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "frames/record_codec.h"
#include "ironmoat/command_response.h"
#include "sandbox_parts/sandbox_parts.h"

namespace {

using namespace ironmoat;
using namespace std::chrono_literals;

void write(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t count = ::write(STDOUT_FILENO, bytes.data(), bytes.size());
    if (count <= 0) std::_Exit(2);
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
}

void write(BlockBuilder& frames) { write({frames.bytes(), frames.size()}); }

[[noreturn]] void hang() {
  for (;;) ::pause();
}

void reply(std::uint64_t id, int status, std::string_view body) {
  BlockBuilder out;
  const std::size_t start = frames::beginReply(out, id, static_cast<frames::Status>(status));
  out.append(body);
  frames::endReply(out, start);
  write(out);
}

void answer(std::uint64_t id, Int number) {
  VeskCommandResponseArguments arguments;
  arguments.command = number;
  BlockBuilder record;
  frames::encodeRecord(VeskCommandResponse::with(std::move(arguments)), record);
  reply(id, 0, {record.bytes(), record.size()});
}

/// Descriptors, environment and signal state that a service should not have been given.
Int inheritedThings() {
  Int things = 0;
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    const bool itself = std::filesystem::read_symlink(entry).string().starts_with("/proc/");
    if (std::stoi(entry.path().filename()) > 2 && !itself) ++things;
  }
  if (environ != nullptr && *environ != nullptr) ++things;
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);) {
    if (!line.starts_with("SigBlk:") && !line.starts_with("SigIgn:")) continue;
    constexpr unsigned long long kOfLibc = 0x180000000;  // 32 and 33, which it sets up by itself
    if ((std::stoull(line.substr(8), nullptr, 16) & ~kOfLibc) != 0) ++things;
  }
  return things;
}

void serve(const frames::Request& request) {
  static bool takenOver = false;
  if (takenOver) std::_Exit(66);

  const std::string_view text = request.message.view();
  const std::size_t space = text.find(' ');
  const std::string_view verb = text.substr(0, space);
  Int number = 0;
  if (space != std::string_view::npos) {
    std::from_chars(text.data() + space + 1, text.data() + text.size(), number);
  }
  const std::uint64_t id = request.id;
  BlockBuilder out;
  if (verb == "echo") {
    answer(id, number);
  } else if (verb == "refuse") {
    const DecodingError error(DecodingError::Kind::typeMismatch, "a[1].b", "expected data");
    frames::appendRejection(out, id, error);
  } else if (verb == "notServed") {
    frames::appendDescription(out, id, frames::Status::notServed, "nobody unpacks this");
  } else if (verb == "slow") {  // so many milliseconds
    std::this_thread::sleep_for(std::chrono::milliseconds(number));
    answer(id, number);
  } else if (verb == "inherited") {
    answer(id, inheritedThings());
  } else if (verb == "signal") {
    ::raise(static_cast<int>(number));
  } else if (verb == "words") {  // on standard error
    std::fputs("last \x1b\xff\n words of it\n\n", stderr);
    ::raise(SIGABRT);
  } else if (verb == "exit") {
    std::_Exit(static_cast<int>(number));
  } else if (verb == "takeOver") {  // the next request will be the one to suffer
    takenOver = true;
    answer(id, number);
  } else if (verb == "hang" || verb == "ignore") {
    hang();
  } else if (verb == "close") {
    ::close(STDIN_FILENO);
    ::close(STDOUT_FILENO);
    hang();
  } else if (verb == "stopReading") {  // the client's next write fails
    ::shutdown(STDIN_FILENO, SHUT_RD);
    std::this_thread::sleep_for(50ms);
    ::close(STDIN_FILENO);
    ::close(STDOUT_FILENO);
    hang();
  } else if (verb == "foresee") {  // a reply to what it will be asked next, it thinks
    answer(id, number);
    std::this_thread::sleep_for(5ms);
    answer(id + 1, number + 40);
  } else if (verb == "twiceOther") {  // the ids of two requests in flight, in the wrong order
    answer(~id, number);
  } else if (verb == "nextId") {  // asked for soon, perhaps, but not yet
    answer(id + 1, number);
  } else if (verb == "twice") {
    answer(id, number);
    answer(id, number);
  } else if (verb == "absurdLength") {
    write("\xff\xff\xff\xff....");
  } else if (verb == "badRecord") {
    reply(id, 0, "\xff\xff\xff\xff\xff\xff\xff\xff");
  } else if (verb == "badStatus") {
    reply(id, 4, "");
  } else if (verb == "badText") {
    reply(id, 2, "\xff");
  } else if (verb == "greetAgain") {
    frames::appendHello(out, frames::Hello::ours());
  } else if (verb == "flood") {  // the longest reply that may be announced, and no end after it
    const std::string plenty(std::size_t{1} << 20, '\xaa');
    write(std::string_view("\x09\0\0\x09", 4));
    for (;;) write(plenty);
  } else if (verb == "drip") {  // a reply of megabytes, a byte at a time
    write(std::string_view("\0\0\x40\0", 4));
    for (;;) {
      write(".");
      std::this_thread::sleep_for(1ms);
    }
  } else if (verb == "unasked") {  // bytes when nothing is owed
    answer(id, number);
    write(std::string_view("\x20\0\0\0", 4));
    hang();
  }
  if (out.size() != 0) write(out);
}

}  // namespace

int main(int, char** arguments) {
  ::alarm(60);  // whatever becomes of the test
  const std::string name = std::filesystem::path(arguments[0]).filename();
  if (name == "silent") hang();
  if (name == "leaves") return 5;
  if (name == "lacks_a_part") return 65;
  if (name == "late") std::this_thread::sleep_for(50ms);
  frames::Hello hello = frames::Hello::ours();
  if (name != "unsandboxed") hello.sandbox = sandbox::kRequiredParts;
  if (name == "other_limits") hello.recordBytes /= 2;
  BlockBuilder greeting;
  frames::appendHello(greeting, hello);
  if (name == "garbled") greeting.bytes()[4] ^= 1;
  if (name == "chatty") greeting.push('x');
  write(greeting);
  if (name == "leaves_after_hello") return 0;

  frames::FrameAssembler assembler(frames::kMaxRequestBody, Sharing::oneThread);
  for (;;) {
    const auto room = assembler.room();
    const ssize_t count = ::read(STDIN_FILENO, room.data(), room.size());
    if (count <= 0) return 0;
    assembler.commit(static_cast<std::size_t>(count));
    while (const auto body = assembler.next()) serve(frames::parseRequest(*body));
  }
}
