// payload_daemon SOCKET [SERVICE]: takes payload messages that anyone may send as datagrams to a
// Unix socket, has each one unpacked, and prints what it would deliver or why it does not. A few
// threads, each with one message at a time. Ends with SIGTERM.

#include <ironmoat/client.h>

#include <atomic>
#include <csignal>
#include <thread>
#include <vector>

#include "daemon.h"

namespace {

using ironmoat::Data;
using ironmoat::DrelUserPayload;

// A message that takes its two seconds until the deadline holds up one of them only.
constexpr int kWorkers = 4;

std::atomic<bool> stopping = false;

void work(ironmoat::Client& client, int socket) {
  std::string buffer;
  const auto unpack = [&](const Data& message) {
    if (!stopping) daemons::handle(client.tryUnpack<DrelUserPayload>(message));
  };
  while (!stopping) {
    if (daemons::receive(socket, buffer, 0, unpack) || errno == EINTR) continue;
    std::perror("recv");
    std::_Exit(1);
  }
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2 && argc != 3) {
    std::cerr << "usage: payload_daemon SOCKET [SERVICE]\n";
    return 2;
  }
  // Waited for below. Blocked before there is any other thread, which would take them otherwise.
  sigset_t ends;
  sigemptyset(&ends);
  sigaddset(&ends, SIGTERM);
  sigaddset(&ends, SIGINT);
  pthread_sigmask(SIG_BLOCK, &ends, nullptr);

  ironmoat::Client::Options options;
  if (argc == 3) options.program = argv[2];
  ironmoat::Client client(options);  // one for all threads
  // A service that is not there is better noticed now than with the first message. (No bytes are no
  // message: there is no record.)
  const auto nothing = client.tryUnpack<DrelUserPayload>(Data());
  if (nothing.decodingError() == nullptr) {
    daemons::handle(nothing);
    return 1;
  }
  const int socket = daemons::listenOn(argv[1]);
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
