// payload_daemon SOCKET: takes payload messages that anyone may send as datagrams to a Unix socket,
// has each one unpacked, and prints what it would deliver or why it does not. Ends with SIGTERM.

#include <ironmoat/client.h>
#include <ironmoat/user_payload.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <iostream>
#include <new>
#include <string>
#include <string_view>
#include <syncstream>
#include <thread>
#include <vector>

namespace {

// Each works on one message at a time, so that a message that takes its two seconds until the
// deadline holds up one of them only.
constexpr int kWorkers = 4;
constexpr std::size_t kLongestDatagram = std::size_t{256} << 10;

std::atomic<bool> stopping = false;

/// A line of a log for `text` of a stranger's: without line ends, escape sequences and other bytes
/// that a terminal or a reader of logs could take for its own.
std::string printable(std::string_view text) {
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

/// Whatever the daemon is for.
void deliver(const ironmoat::DrelUserPayload& message) {
  std::osyncstream out(std::cout);
  out << "deliver: command " << message.command;
  if (message.messageId) out << ", id " << printable(*message.messageId);
  if (message.senderId) out << ", from " << printable(*message.senderId);
  if (message.payload) out << ", " << message.payload->size() << " bytes";
  if (!message.corvelMessageList.empty()) {
    out << ", with " << message.corvelMessageList.size() << " more";
  }
  out << std::endl;
}

void handle(ironmoat::Client& client, std::string_view datagram) {
  try {
    deliver(client.unpack<ironmoat::DrelUserPayload>(ironmoat::Data(datagram)));
  } catch (const ironmoat::DecodingError& error) {
    // The sender's fault: the same bytes will always be refused. Nothing to be tried again.
    std::osyncstream(std::cout) << "refused: " << nameOf(error.kind()) << " at '"
                                << printable(error.path()) << "': " << printable(error.what())
                                << std::endl;
  } catch (const ironmoat::ServiceError& error) {
    // After `crashed` and `timedOut` once more at most; after `unavailable` later, as often as
    // needed.
    std::osyncstream(std::cout) << "not unpacked: " << nameOf(error.kind()) << ": "
                                << printable(error.what()) << std::endl;
  } catch (const std::bad_alloc&) {  // a record may take megabytes more than its message
    std::fputs("not unpacked: out of memory\n", stderr);
  }
}

void work(ironmoat::Client& client, int socket) {
  std::string buffer(kLongestDatagram, '\0');
  while (!stopping) {
    // MSG_TRUNC: the datagram's whole length, though what is over the buffer's is lost.
    const ssize_t length = ::recv(socket, buffer.data(), buffer.size(), MSG_TRUNC);
    if (stopping) return;
    if (length < 0) {
      if (errno == EINTR) continue;
      std::perror("recv");
      std::_Exit(1);
    }
    const auto size = static_cast<std::size_t>(length);
    if (size > buffer.size()) {
      std::osyncstream(std::cout) << "refused: a datagram of " << size << " bytes" << std::endl;
    } else {
      handle(client, std::string_view(buffer).substr(0, size));
    }
  }
}

int listenOn(const char* path) {
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

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2) {
    std::cerr << "usage: payload_daemon SOCKET\n";
    return 2;
  }
  // Waited for below. Blocked before there is any other thread, which would take them otherwise.
  sigset_t ends;
  sigemptyset(&ends);
  sigaddset(&ends, SIGTERM);
  sigaddset(&ends, SIGINT);
  pthread_sigmask(SIG_BLOCK, &ends, nullptr);

  ironmoat::Client client;  // one for all threads
  try {  // A service that is not there is better noticed now than with the first message.
    client.unpack<ironmoat::DrelUserPayload>(ironmoat::Data());
  } catch (const ironmoat::DecodingError&) {  // right: no bytes are no message
  } catch (const ironmoat::ServiceError& error) {
    std::cerr << "payload_daemon: " << error.what() << '\n';
    return 1;
  }
  const int socket = listenOn(argv[1]);
  if (socket < 0) {
    std::cerr << "payload_daemon: " << argv[1] << ": " << std::strerror(errno) << '\n';
    return 1;
  }
  std::vector<std::jthread> workers;
  for (int i = 0; i < kWorkers; ++i) workers.emplace_back([&] { work(client, socket); });
  std::cout << "ready" << std::endl;

  int signal = 0;
  sigwait(&ends, &signal);
  stopping = true;
  ::shutdown(socket, SHUT_RD);  // wakes them all; each first finishes what it is at
}
