#pragma once

#include <ironmoat/outcome.h>
#include <ironmoat/stats.h>
#include <ironmoat/user_payload.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iostream>
#include <new>
#include <string>
#include <string_view>
#include <syncstream>

/// What the example daemons share: a socket that anyone may send payload messages to, and a log on
/// standard output.
namespace daemons {

constexpr std::size_t kMaxDatagram = std::size_t{256} << 10;

/// A line of a log for `text` of a stranger's: without line ends, escape sequences and other bytes
/// that a terminal or a reader of logs could take for its own.
inline std::string printable(std::string_view text) {
  std::string out;
  for (const char byte : text.substr(0, 200)) {
    if (byte >= ' ' && byte <= '~' && byte != '\\') {
      out += byte;
    } else {
      char escaped[5];
      std::snprintf(escaped, sizeof escaped, "\\x%02x", static_cast<unsigned char>(byte));
      out += escaped;
    }
  }
  return text.size() > 200 ? out + "..." : out;
}

/// Stands for whatever the daemon is for: prints what it would deliver, or why it does not.
inline void handle(const ironmoat::Outcome<ironmoat::DrelUserPayload>& outcome) {
  std::osyncstream out(std::cout);
  if (const auto* const rejected = outcome.decodingError()) {
    // The sender's fault: the same bytes will always be refused. Nothing to be tried again.
    out << "refused: " << nameOf(rejected->kind()) << " at '" << printable(rejected->path())
        << "': " << printable(rejected->what());
  } else if (const auto* const failed = outcome.serviceError()) {
    // After `crashed` and `timedOut` once more at most; after `unavailable` later, as often as
    // needed.
    out << "not unpacked: " << nameOf(failed->kind()) << ": " << printable(failed->what());
  } else if (outcome.outOfMemory()) {  // a record may take megabytes more than its message
    out << "not unpacked: out of memory";
  } else {
    out << "deliver: command " << outcome->command;
    if (outcome->messageId) out << ", id " << printable(*outcome->messageId);
    if (outcome->senderId) out << ", from " << printable(*outcome->senderId);
    if (outcome->payload) out << ", " << outcome->payload->size() << " bytes";
    const std::size_t more = outcome->corvelMessageList.size();
    if (more > 0) out << ", with " << more << " more";
  }
  out << std::endl;
}

/// A socket for datagrams, bound to `path`; -1 with errno if there is none.
inline int listenOn(const char* path) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  if (std::strlen(path) >= sizeof address.sun_path) {
    errno = ENAMETOOLONG;
    return -1;
  }
  std::strcpy(address.sun_path, path);
  ::unlink(path);  // of an earlier run
  const int socket = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  const auto* const generic = reinterpret_cast<const sockaddr*>(&address);
  return socket < 0 || ::bind(socket, generic, sizeof address) != 0 ? -1 : socket;
}

/// Calls `take` with the next datagram, which is read into `buffer`, or refuses it for its length.
/// False with errno if there is none. `flags` are those of recv().
template <class Take>
bool receive(int socket, std::string& buffer, int flags, const Take& take) {
  buffer.resize(kMaxDatagram);
  // MSG_TRUNC: the datagram's whole length, though what is over the buffer's is lost.
  const ssize_t length = ::recv(socket, buffer.data(), buffer.size(), flags | MSG_TRUNC);
  if (length < 0) return false;
  const auto size = static_cast<std::size_t>(length);
  try {
    if (size <= buffer.size()) {
      take(ironmoat::Data(std::string_view(buffer).substr(0, size)));
    } else {
      std::osyncstream(std::cout) << "refused: a datagram of " << size << " bytes" << std::endl;
    }
  } catch (const std::bad_alloc&) {
    std::fputs("not unpacked: out of memory\n", stderr);
  }
  return true;
}

/// Whether a daemon with an event loop may take one message more. The others wait in the socket,
/// and their senders with them. Empty messages have no bytes, but take memory, too.
inline bool hasRoom(const ironmoat::Stats& stats) {
  return stats.bytesInFlight < std::uint64_t{1} << 20 && stats.inFlight < 1000;
}

}  // namespace daemons
