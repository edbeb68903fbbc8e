// poll_daemon SOCKET [SERVICE]: does what payload_daemon does, on one thread, around poll().

#include <ironmoat/event_loop_client.h>
#include <poll.h>
#include <sys/signalfd.h>

#include <csignal>

#include "../daemon/daemon.h"

namespace {

using ironmoat::Data;
using ironmoat::DrelUserPayload;
using ironmoat::EventLoopClient;

int fail(const char* what) {
  std::cerr << "poll_daemon: " << what << ": " << std::strerror(errno) << '\n';
  return 1;
}

/// Submits what has come, but not more at once than keeps the loop going round.
void receiveAll(EventLoopClient& client, int socket, std::string& buffer) {
  const auto submit = [&](const Data& message) {
    client.submit<DrelUserPayload>(message, daemons::handle);
  };
  for (int i = 0; i < 64 && daemons::hasRoom(client.stats()); ++i) {
    if (!daemons::receive(socket, buffer, MSG_DONTWAIT, submit)) return;
  }
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2 && argc != 3) {
    std::cerr << "usage: poll_daemon SOCKET [SERVICE]\n";
    return 2;
  }
  sigset_t ends;
  sigemptyset(&ends);
  sigaddset(&ends, SIGTERM);
  sigaddset(&ends, SIGINT);
  sigprocmask(SIG_BLOCK, &ends, nullptr);
  const int signals = ::signalfd(-1, &ends, SFD_CLOEXEC);
  if (signals < 0) return fail("signalfd");
  const int socket = daemons::listenOn(argv[1]);
  if (socket < 0) return fail(argv[1]);

  EventLoopClient::Options options;
  if (argc == 3) options.program = argv[2];
  EventLoopClient client(options);
  bool stopping = false;
  int status = 0;
  // A service that is not there is better noticed now than with the first message. (No bytes are no
  // message: there is no record.)
  client.submit<DrelUserPayload>(Data(), [&](const auto& nothing) {
    if (nothing.decodingError() != nullptr) {
      std::cout << "ready" << std::endl;
      return;
    }
    daemons::handle(nothing);
    status = 1;
    stopping = true;
  });

  std::string buffer;
  while (!stopping || client.stats().inFlight > 0) {
    const bool receives = !stopping && daemons::hasRoom(client.stats());
    pollfd watched[] = {{client.fd(), POLLIN, 0},
                        {stopping ? -1 : signals, POLLIN, 0},
                        {receives ? socket : -1, POLLIN, 0}};
    if (::poll(watched, std::size(watched), client.timeout()) < 0 && errno != EINTR) {
      return fail("poll");
    }
    if (watched[1].revents != 0) stopping = true;
    if (watched[2].revents != 0) receiveAll(client, socket, buffer);
    client.dispatch();
  }
  return status;
}
