#pragma once

#include <pthread.h>

#include <csignal>
#include <thread>
#include <utility>

namespace ironmoat::client {

/// Starts a thread that leaves signals to the daemon's own threads, but for those that a thread
/// causes itself. Throws std::system_error.
template <class... Call>
std::thread startQuietThread(Call&&... call) {
  sigset_t foreign;
  ::sigfillset(&foreign);
  for (const int own : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS, SIGABRT}) {
    ::sigdelset(&foreign, own);
  }
  // A new thread starts with its maker's mask.
  struct Masked {
    explicit Masked(const sigset_t& set) { ::pthread_sigmask(SIG_BLOCK, &set, &before); }
    ~Masked() { ::pthread_sigmask(SIG_SETMASK, &before, nullptr); }
    sigset_t before;
  };
  const Masked masked(foreign);
  return std::thread(std::forward<Call>(call)...);
}

}  // namespace ironmoat::client
