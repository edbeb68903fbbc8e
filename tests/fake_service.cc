// A service that does what each message tells it, for tests of clients: it answers, dies, hangs,
// lies. A message is a script of steps such as `sleep 20;answer 7`; see `perform`. Its own name is
// the script of its start, unless it is run as fake_service.

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

void reply(std::uint64_t id, char status, std::string_view body) {
  BlockBuilder out;
  const std::size_t start = frames::beginReply(out, id, static_cast<frames::Status>(status));
  out.append(body);
  frames::endReply(out, start);
  write({out.bytes(), out.size()});
}

void answer(std::uint64_t id, Int number) {
  VeskCommandResponseArguments arguments;
  arguments.command = number;
  BlockBuilder record;
  frames::encodeRecord(VeskCommandResponse::with(std::move(arguments)), record);
  reply(id, 0, {record.bytes(), record.size()});
}

void greet(std::string_view how) {
  frames::Hello hello = frames::Hello::ours();
  if (how != "unsandboxed") hello.sandbox = sandbox::kRequiredParts;
  if (how == "smaller") hello.recordBytes /= 2;
  BlockBuilder out;
  frames::appendHello(out, hello);
  write({out.bytes(), out.size()});
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

bool lastRequest = false;

/// One step of a script. `id` is the one that its answers are to have.
void perform(std::string_view verb, std::string_view rest, std::uint64_t& id) {
  Int number = 0;
  std::from_chars(rest.data(), rest.data() + rest.size(), number);
  if (verb == "answer") answer(id, number);
  if (verb == "inherited") answer(id, inheritedThings());
  if (verb == "id") id += static_cast<std::uint64_t>(number);
  if (verb == "hello") greet(rest);
  if (verb == "head") static_cast<void>(::read(0, &id, 4) + ::read(0, &id, sizeof id));
  if (verb == "write") write(rest);
  if (verb == "say") static_cast<void>(!::write(STDERR_FILENO, rest.data(), rest.size()));
  if (verb == "sleep") std::this_thread::sleep_for(std::chrono::milliseconds(number));
  if (verb == "exit") std::_Exit(static_cast<int>(number));
  if (verb == "signal") ::raise(static_cast<int>(number));
  if (verb == "last") lastRequest = true;  // the next one is fatal
  if (verb == "stopReading") ::shutdown(STDIN_FILENO, SHUT_RD);
  if (verb == "close") ::close(STDIN_FILENO), ::close(STDOUT_FILENO);
  while (verb == "hang") ::pause();
  const std::string plenty(std::size_t{verb == "flood"} << 20, '\xaa');
  while (verb == "flood") write(plenty);
  for (; verb == "drip"; std::this_thread::sleep_for(1ms)) write(".");
}

/// `reply` is the last step: its status and body are all that follows.
void perform(std::string_view script, std::uint64_t id) {
  if (script.starts_with("reply ")) return reply(id, script[6], script.substr(7));
  const std::string_view step = script.substr(0, script.find(';'));
  const std::string_view verb = step.substr(0, step.find(' '));
  perform(verb, step.substr(std::min(verb.size() + 1, step.size())), id);
  if (step.size() < script.size()) perform(script.substr(step.size() + 1), id);
}

}  // namespace

int main(int, char** arguments) {
  ::alarm(60);  // whatever becomes of the test
  const std::string name = std::filesystem::path(arguments[0]).filename();
  perform(name == "fake_service" ? "hello" : name, 0);
  frames::FrameAssembler assembler(frames::kMaxRequestBody, Sharing::oneThread);
  for (;;) {
    const auto room = assembler.room();
    const ssize_t count = ::read(STDIN_FILENO, room.data(), room.size());
    if (count <= 0) return 0;
    assembler.commit(static_cast<std::size_t>(count));
    while (const auto body = assembler.next()) {
      if (lastRequest) std::_Exit(66);
      const frames::Request request = frames::parseRequest(*body);
      perform(request.message.view(), request.id);
    }
  }
}
