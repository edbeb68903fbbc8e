#pragma once

#include <sys/types.h>

#include <chrono>
#include <csignal>
#include <stdexcept>
#include <string>
#include <utility>

#include "process/file_descriptor.h"

namespace ironmoat::process {

/// A process could not be started; `what()` says which program and why.
class StartError : public std::runtime_error {
 public:
  /// `lasting`: trying again is useless. Otherwise memory or descriptors ran out.
  StartError(const std::string& message, bool lasting)
      : std::runtime_error(message), lasting_(lasting) {}
  [[nodiscard]] bool lasting() const noexcept { return lasting_; }

 private:
  bool lasting_;
};

/// One running service, with a socket to its standard input and output and a pipe from its standard
/// error. Closing the pipe makes the kernel kill the service, so that its end needs no permission
/// and does not depend on who dies. A process id that may belong to another process by now is never
/// signalled, whatever the daemon does with SIGCHLD and its own wait calls.
class ServiceProcess {
 public:
  /// Starts `program`, in a session of its own, with nothing of the daemon's but the socket and the
  /// pipe: no other descriptor, no environment, no signal handler or mask. Throws StartError.
  static ServiceProcess start(const std::string& program);

  ServiceProcess(ServiceProcess&& other) noexcept { *this = std::move(other); }
  ServiceProcess& operator=(ServiceProcess&&) noexcept;
  /// Kills the process if it still runs, and reaps it. One that cannot be killed is left to itself
  /// after kMaxWait.
  ~ServiceProcess() { end(); }

  /// Nonblocking; owned by this object.
  [[nodiscard]] int socket() const noexcept { return socket_.get(); }
  /// Readable once the process has ended; -1 where the kernel has no pidfd for it.
  [[nodiscard]] int endedFd() const noexcept { return pidfd_.get(); }

  /// How the process ended: "was killed by SIGSEGV", "exited with status 3"; then in brackets the
  /// start of what it wrote to standard error, printable ASCII only. Waits up to `grace` for that
  /// end; "closed its connection" if it has not ended by then. To be called once.
  [[nodiscard]] std::string lastWord(std::chrono::milliseconds grace);

 private:
  static constexpr auto kMaxWait = std::chrono::milliseconds(1000);

  ServiceProcess(FileDescriptor socket, FileDescriptor words) noexcept
      : socket_(std::move(socket)), words_(std::move(words)) {}
  [[nodiscard]] bool adopt(pid_t pid) noexcept;
  /// Reaps the process if it ends within `time`; false if it runs on. Sets `status_` if it was not
  /// reaped by others.
  bool reap(std::chrono::milliseconds time) noexcept;
  void end() noexcept;
  [[nodiscard]] std::string wordsOnStandardError() const;

  FileDescriptor socket_;
  FileDescriptor words_;
  FileDescriptor pidfd_;
  pid_t pid_ = 0;  // 0 once it is reaped
  siginfo_t status_ = {};
};

}  // namespace ironmoat::process
