#pragma once

#include <sys/types.h>

#include <chrono>
#include <stdexcept>
#include <string>

#include "client/file_descriptor.h"

namespace ironmoat::client {

/// A process could not be started; `what()` says which program and why.
class StartError : public std::runtime_error {
 public:
  /// `passing`: it may work in a moment (memory or descriptors ran out), so trying again is
  /// sensible.
  StartError(const std::string& message, bool passing)
      : std::runtime_error(message), passing_(passing) {}
  [[nodiscard]] bool passing() const noexcept { return passing_; }

 private:
  bool passing_;
};

/// One running service, with a socket to its standard input and output, and a pipe from its
/// standard error. Whatever the daemon does with SIGCHLD and with wait calls of its own, the
/// process is signalled and reaped through a pidfd: a process id that was given to someone else is
/// never touched.
class ServiceProcess {
 public:
  /// Starts `program` with nothing of the daemon's but the socket and the pipe: no other
  /// descriptor, no environment, no signal handler or mask. Throws StartError.
  static ServiceProcess start(const std::string& program);

  ServiceProcess(ServiceProcess&&) noexcept = default;
  ServiceProcess& operator=(ServiceProcess&&) = delete;
  /// Kills it when it still runs, and reaps it.
  ~ServiceProcess();

  /// Nonblocking, ours alone.
  [[nodiscard]] int socket() const noexcept { return socket_.get(); }
  /// Readable once the process has ended.
  [[nodiscard]] int endedFd() const noexcept { return pidfd_.get(); }

  /// Waits up to `grace` for it to end by itself, kills it otherwise, and says how it ended: "was
  /// killed by SIGSEGV", "exited with status 3"; behind it in brackets the first of what it wrote
  /// to standard error, in printable ASCII alone. To be called once.
  [[nodiscard]] std::string lastWord(std::chrono::milliseconds grace);

 private:
  ServiceProcess(FileDescriptor socket, FileDescriptor words, FileDescriptor pidfd) noexcept;
  [[nodiscard]] bool endsWithin(std::chrono::milliseconds grace) const noexcept;
  void kill() const noexcept;
  [[nodiscard]] std::string wordsOnStandardError() const;

  FileDescriptor socket_;
  FileDescriptor words_;
  FileDescriptor pidfd_;
};

}  // namespace ironmoat::client
