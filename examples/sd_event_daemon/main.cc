// sd_event_daemon SOCKET [SERVICE]: does what payload_daemon does, on one thread, in an event loop
// of libsystemd.

#include <ironmoat/event_loop_client.h>
#include <sys/epoll.h>
#include <systemd/sd-event.h>

#include <csignal>
#include <memory>

#include "../daemon/daemon.h"

namespace {

using ironmoat::Data;
using ironmoat::DrelUserPayload;
using ironmoat::EventLoopClient;

struct Daemon {
  EventLoopClient client;
  int socket;
  bool stopping = false;
  int status = 0;
  std::string buffer = {};
  sd_event* loop = nullptr;
  sd_event_source* arrivals = nullptr;  // readable: the socket
  sd_event_source* replies = nullptr;   // readable: the client's descriptor
  sd_event_source* timer = nullptr;     // of the client
};

/// Before each wait: how long it may last, and whether the socket is part of it.
int prepare(sd_event_source*, void* data) {
  auto& daemon = *static_cast<Daemon*>(data);
  const bool receives = !daemon.stopping && daemons::hasRoom(daemon.client.stats());
  sd_event_source_set_enabled(daemon.arrivals, receives ? SD_EVENT_ON : SD_EVENT_OFF);
  const int timeout = daemon.client.timeout();
  if (timeout < 0) return sd_event_source_set_enabled(daemon.timer, SD_EVENT_OFF);
  sd_event_source_set_time_relative(daemon.timer, static_cast<std::uint64_t>(timeout) * 1000);
  return sd_event_source_set_enabled(daemon.timer, SD_EVENT_ONESHOT);
}

int dispatch(Daemon& daemon) {
  daemon.client.dispatch();
  if (!daemon.stopping || daemon.client.stats().inFlight > 0) return 0;
  return sd_event_exit(daemon.loop, daemon.status);
}

int onReplies(sd_event_source*, int, std::uint32_t, void* data) {
  return dispatch(*static_cast<Daemon*>(data));
}

int onTime(sd_event_source*, std::uint64_t, void* data) {
  return dispatch(*static_cast<Daemon*>(data));
}

int onEnd(sd_event_source*, const signalfd_siginfo*, void* data) {
  auto& daemon = *static_cast<Daemon*>(data);
  daemon.stopping = true;
  return dispatch(daemon);
}

/// Submits what has come, but not more at once than keeps the loop going round.
int onArrivals(sd_event_source*, int socket, std::uint32_t, void* data) {
  auto& daemon = *static_cast<Daemon*>(data);
  const auto submit = [&](const Data& message) {
    daemon.client.submit<DrelUserPayload>(message, daemons::handle);
  };
  for (int i = 0; i < 64 && daemons::hasRoom(daemon.client.stats()); ++i) {
    if (!daemons::receive(socket, daemon.buffer, MSG_DONTWAIT, submit)) break;
  }
  return dispatch(daemon);
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2 && argc != 3) {
    std::cerr << "usage: sd_event_daemon SOCKET [SERVICE]\n";
    return 2;
  }
  sigset_t ends;
  sigemptyset(&ends);
  sigaddset(&ends, SIGTERM);
  sigprocmask(SIG_BLOCK, &ends, nullptr);  // as the loop wants them

  EventLoopClient::Options options;
  if (argc == 3) options.program = argv[2];
  Daemon daemon = {.client = EventLoopClient(options), .socket = daemons::listenOn(argv[1])};
  if (daemon.socket < 0) {
    std::cerr << "sd_event_daemon: " << argv[1] << ": " << std::strerror(errno) << '\n';
    return 1;
  }
  sd_event* loop = nullptr;
  // The timer's accuracy is one microsecond: with none given it would be late by up to 250 ms.
  if (sd_event_new(&loop) < 0 || sd_event_add_signal(loop, nullptr, SIGTERM, onEnd, &daemon) < 0 ||
      sd_event_add_io(loop, &daemon.arrivals, daemon.socket, EPOLLIN, onArrivals, &daemon) < 0 ||
      sd_event_add_io(loop, &daemon.replies, daemon.client.fd(), EPOLLIN, onReplies, &daemon) < 0 ||
      sd_event_add_time(loop, &daemon.timer, CLOCK_MONOTONIC, 0, 1, onTime, &daemon) < 0 ||
      sd_event_source_set_prepare(daemon.replies, prepare) < 0) {
    std::cerr << "sd_event_daemon: cannot set up the event loop\n";
    return 1;
  }
  daemon.loop = loop;
  // A service that is not there is better noticed now than with the first message. (No bytes are no
  // message: there is no record.)
  daemon.client.submit<DrelUserPayload>(Data(), [&daemon](const auto& nothing) {
    if (nothing.decodingError() != nullptr) {
      std::cout << "ready" << std::endl;
      return;
    }
    daemons::handle(nothing);
    daemon.status = 1;
    daemon.stopping = true;
  });
  const int result = sd_event_loop(loop);
  for (sd_event_source* source : {daemon.arrivals, daemon.replies, daemon.timer}) {
    sd_event_source_disable_unref(source);
  }
  sd_event_unref(loop);
  return result < 0 ? 1 : result;
}
