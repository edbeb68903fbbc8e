// ironmoat-fake-service: for the tests of a daemon. Give its path to ClientOptions::program. It
// hands each request to the real service in its own folder, and the reply back, unless the message
// contains the text `fake:` and one of
//
//   crashed          the process aborts
//   timedOut         no reply
//   unavailable      the reply says that this request is not served
//   rejectedByHost   the reply says that the host rejected the record
//   notEnoughMemory  the reply says that decoding ran out of memory
//
// Any string field of an otherwise valid message can hold this text, in both formats. It trusts its
// client and has no sandbox of its own: never use it where messages come from a network.

#include <spawn.h>
#include <sys/socket.h>
#include <unistd.h>

#include <climits>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

#include "ironmoat/limits.h"

namespace {

constexpr std::size_t kLengthBytes = 4;
constexpr std::size_t kIdBytes = 8;
constexpr std::size_t kMaxRequest = kIdBytes + 1 + 255 + ironmoat::limits::messageBytes;
constexpr char kRejected = 1;  // statuses of a reply
constexpr char kNotServed = 2;
constexpr char kRejectedByHost = 5;  // kinds of rejections
constexpr char kNotEnoughMemory = 6;

/// False if the input ends before `size` bytes.
bool readAll(int from, char* to, std::size_t size) {
  while (size > 0) {
    const ssize_t count = ::read(from, to, size);
    if (count <= 0) return false;
    to += count;
    size -= static_cast<std::size_t>(count);
  }
  return true;
}

void writeAll(int to, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t count = ::write(to, bytes.data(), bytes.size());
    if (count <= 0) std::_Exit(1);
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
}

std::string littleEndian(std::uint64_t value, std::size_t size) {
  std::string bytes;
  for (std::size_t i = 0; i < size; ++i) bytes += static_cast<char>(value >> (8 * i));
  return bytes;
}

std::size_t lengthIn(const char* bytes) {
  std::size_t length = 0;
  for (std::size_t i = kLengthBytes; i-- > 0;) {
    length = length << 8 | static_cast<unsigned char>(bytes[i]);
  }
  return length;
}

/// Copies one frame, however long, from the real service to the client.
void forwardFrame(int service) {
  char buffer[1 << 16];
  if (!readAll(service, buffer, kLengthBytes)) std::_Exit(1);
  writeAll(STDOUT_FILENO, {buffer, kLengthBytes});
  for (std::size_t left = lengthIn(buffer); left > 0;) {
    const ssize_t count = ::read(service, buffer, left < sizeof buffer ? left : sizeof buffer);
    if (count <= 0) std::_Exit(1);
    writeAll(STDOUT_FILENO, {buffer, static_cast<std::size_t>(count)});
    left -= static_cast<std::size_t>(count);
  }
}

void reply(std::string_view id, char status, std::string_view rest) {
  std::string body(id);
  body += status;
  body += rest;
  writeAll(STDOUT_FILENO, littleEndian(body.size(), kLengthBytes) + body);
}

void reject(std::string_view id, char kind, std::string_view description) {
  std::string rest(1, kind);
  rest += littleEndian(~std::uint64_t{0}, 8);  // no offset
  rest += littleEndian(0, 2);                  // no path
  reply(id, kRejected, rest.append(description));
}

/// False if the request, a frame's body, does not ask for a failure.
bool fail(std::string_view request) {
  const std::string_view id = request.substr(0, kIdBytes);
  const auto asksFor = [&](std::string_view failure) {
    return request.find(failure) != std::string_view::npos;
  };
  if (asksFor("fake:crashed")) std::abort();
  if (asksFor("fake:timedOut")) {
    char ignored;
    while (::read(STDIN_FILENO, &ignored, 1) > 0) continue;
    std::_Exit(0);  // the client has gone
  }
  if (asksFor("fake:unavailable")) {
    reply(id, kNotServed, "the message asks for this failure");
  } else if (asksFor("fake:rejectedByHost")) {
    reject(id, kRejectedByHost, "the message asks for this rejection");
  } else if (asksFor("fake:notEnoughMemory")) {
    reject(id, kNotEnoughMemory, "the message asks for this rejection");
  } else {
    return false;
  }
  return true;
}

/// Starts the real service in the folder of this program; our end of its connection, or -1.
int startService() {
  char self[PATH_MAX];
  const ssize_t size = ::readlink("/proc/self/exe", self, sizeof self);
  if (size <= 0) return -1;
  std::string program(self, static_cast<std::size_t>(size));
  program.replace(program.rfind('/') + 1, std::string::npos, "VeskIronmoatService");

  int ends[2];
  if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) return -1;
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, ends[1], STDIN_FILENO);
  posix_spawn_file_actions_adddup2(&actions, ends[1], STDOUT_FILENO);
  char* arguments[] = {program.data(), nullptr};
  char* environment[] = {nullptr};
  pid_t pid = 0;
  const int error = ::posix_spawn(&pid, program.c_str(), &actions, nullptr, arguments, environment);
  posix_spawn_file_actions_destroy(&actions);
  ::close(ends[1]);
  if (error == 0) return ends[0];
  static_cast<void>(
      std::fprintf(stderr, "cannot start %s: %s\n", program.c_str(), std::strerror(error)));
  return -1;
}

}  // namespace

int main() {
  const int service = startService();
  if (service < 0) return 1;
  forwardFrame(service);  // the hello
  std::string frame;
  for (;;) {
    frame.resize(kLengthBytes);
    if (!readAll(STDIN_FILENO, frame.data(), kLengthBytes)) return 0;
    const std::size_t length = lengthIn(frame.data());
    if (length < kIdBytes || length > kMaxRequest) return 1;
    frame.resize(kLengthBytes + length);
    if (!readAll(STDIN_FILENO, frame.data() + kLengthBytes, length)) return 0;
    if (fail(std::string_view(frame).substr(kLengthBytes))) continue;
    writeAll(service, frame);
    forwardFrame(service);
  }
}
