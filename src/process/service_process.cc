#include "process/service_process.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstring>
#include <system_error>
#include <utility>

#include "sandbox_parts/sandbox_parts.h"

namespace ironmoat::process {

namespace {

constexpr std::size_t kMaxWords = 400;
constexpr auto kPidfd = static_cast<idtype_t>(3);  // P_PIDFD, which older <sys/wait.h> lack

[[noreturn]] void throwStartError(const std::string& program, int error) {
  const bool passing =
      error == EAGAIN || error == ENOMEM || error == EMFILE || error == ENFILE || error == ETXTBSY;
  throw StartError("cannot start " + program + ": " + std::generic_category().message(error),
                   !passing);
}

/// posix_spawn's attribute objects, which want to be given back.
struct SpawnSettings {
  posix_spawn_file_actions_t actions;
  posix_spawnattr_t attributes;
  int error;

  SpawnSettings(int socket, int words) {
    posix_spawn_file_actions_init(&actions);
    posix_spawnattr_init(&attributes);
    sigset_t all;
    sigset_t none;
    sigfillset(&all);
    sigemptyset(&none);
    posix_spawnattr_setsigdefault(&attributes, &all);
    posix_spawnattr_setsigmask(&attributes, &none);
    posix_spawnattr_setflags(&attributes,
                             POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSID);
    error = posix_spawn_file_actions_adddup2(&actions, socket, STDIN_FILENO);
    if (error == 0) error = posix_spawn_file_actions_adddup2(&actions, socket, STDOUT_FILENO);
    if (error == 0) error = posix_spawn_file_actions_adddup2(&actions, words, STDERR_FILENO);
    if (error == 0) error = posix_spawn_file_actions_addclosefrom_np(&actions, STDERR_FILENO + 1);
  }
  SpawnSettings(const SpawnSettings&) = delete;
  SpawnSettings& operator=(const SpawnSettings&) = delete;
  ~SpawnSettings() {
    posix_spawn_file_actions_destroy(&actions);
    posix_spawnattr_destroy(&attributes);
  }
};

std::string exitWord(int status) {
  std::string word = "exited with status " + std::to_string(status);
  if (const auto* const lack = sandbox::lackToldBy(status)) {
    word += " (unavailable part of its sandbox: " + std::string(lack->name) + ")";
  }
  return word;
}

}  // namespace

ServiceProcess ServiceProcess::start(const std::string& program) {
  int ends[2];
  if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) {
    throwStartError(program, errno);
  }
  FileDescriptor ours(ends[0]);
  FileDescriptor theirs(ends[1]);
  // Packet mode tells the service what the pipe is for. Its end blocks, so that the last words of
  // abort() arrive whole.
  if (::pipe2(ends, O_CLOEXEC | O_DIRECT) != 0) throwStartError(program, errno);
  FileDescriptor words(ends[0]);
  FileDescriptor theirWords(ends[1]);
  // Above the standard three, also in a daemon that has closed its own: otherwise the child's dup2
  // would overwrite what it is about to read.
  for (FileDescriptor* end : {&ours, &theirs, &words, &theirWords}) {
    if (end->get() > STDERR_FILENO) continue;
    const int moved = ::fcntl(end->get(), F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
    if (moved < 0) throwStartError(program, errno);
    *end = FileDescriptor(moved);
  }
  if (::fcntl(ours.get(), F_SETFL, O_NONBLOCK) != 0 ||
      ::fcntl(words.get(), F_SETFL, O_NONBLOCK | O_DIRECT) != 0) {
    throwStartError(program, errno);
  }

  const SpawnSettings settings(theirs.get(), theirWords.get());
  if (settings.error != 0) throwStartError(program, settings.error);
  char* arguments[] = {const_cast<char*>(program.c_str()), nullptr};
  char* environment[] = {nullptr};
  pid_t pid = 0;
  const int error = ::posix_spawn(&pid, program.c_str(), &settings.actions, &settings.attributes,
                                  arguments, environment);
  if (error != 0) throwStartError(program, error);

  ServiceProcess process(std::move(ours), std::move(words));
  if (!process.adopt(pid)) throwStartError(program, ECHILD);
  return process;
}

ServiceProcess& ServiceProcess::operator=(ServiceProcess&& other) noexcept {
  end();
  socket_ = std::move(other.socket_);
  words_ = std::move(other.words_);
  pidfd_ = std::move(other.pidfd_);
  pid_ = std::exchange(other.pid_, 0);
  return *this;
}

/// False when the daemon lets its children be reaped by themselves and this one is gone already:
/// its id may have passed to another process. Without a pidfd (Linux before 5.4, valgrind, some
/// filters) the id is used for as long as the process is our child.
bool ServiceProcess::adopt(pid_t pid) noexcept {
  pid_ = pid;
  pidfd_ = FileDescriptor(static_cast<int>(::syscall(SYS_pidfd_open, pid, 0)));
  siginfo_t info = {};
  if (pidfd_ &&
      ::waitid(kPidfd, static_cast<id_t>(pidfd_.get()), &info, WEXITED | WNOHANG | WNOWAIT) != 0) {
    const bool isStranger = errno == ECHILD;
    pidfd_.reset();
    if (isStranger) pid_ = 0;
  }
  return pid_ != 0;
}

bool ServiceProcess::reap(std::chrono::milliseconds time) noexcept {
  using Clock = std::chrono::steady_clock;
  const auto until = Clock::now() + time;
  while (pid_ != 0) {
    siginfo_t info = {};
    const int result =
        pidfd_ ? ::waitid(kPidfd, static_cast<id_t>(pidfd_.get()), &info, WEXITED | WNOHANG)
               : ::waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOHANG);
    if (result != 0 && errno == ECHILD) {
      pid_ = 0;  // reaped by others
    } else if (result == 0 && info.si_pid != 0) {
      pid_ = 0;
      status_ = info;
    } else {
      const auto left = std::chrono::ceil<std::chrono::milliseconds>(until - Clock::now()).count();
      if (left <= 0) return false;
      pollfd ended = {pidfd_.get(), POLLIN, 0};
      ::poll(&ended, 1, pidfd_ && result == 0 ? static_cast<int>(left) : 1);
    }
  }
  return true;
}

void ServiceProcess::end() noexcept {
  socket_.reset();
  words_.reset();
  if (reap(std::chrono::milliseconds(0))) return;
  if (pidfd_) {
    ::syscall(SYS_pidfd_send_signal, pidfd_.get(), SIGKILL, nullptr, 0);
  } else {
    ::kill(pid_, SIGKILL);
  }
  reap(kMaxWait);
}

std::string ServiceProcess::lastWord(std::chrono::milliseconds grace) {
  if (!reap(grace)) return "closed its connection";
  // The daemon's own wait calls, or its ignoring SIGCHLD, can have taken the status.
  if (status_.si_pid == 0) return "ended with an unknown status";
  std::string word;
  if (status_.si_code == CLD_EXITED) {
    word = exitWord(status_.si_status);
  } else {
    const char* name = ::sigabbrev_np(status_.si_status);
    word = "was killed by ";
    word += name != nullptr ? std::string("SIG").append(name)
                            : std::string("signal ").append(std::to_string(status_.si_status));
  }
  if (const std::string words = wordsOnStandardError(); !words.empty()) {
    word.append(" (").append(words).append(")");
  }
  return word;
}

std::string ServiceProcess::wordsOnStandardError() const {
  char text[kMaxWords];
  std::size_t size = 0;
  // A packet for each write, or a part of one.
  for (ssize_t count = 1; count > 0 && size < sizeof text;) {
    count = ::read(words_.get(), text + size, sizeof text - size);
    if (count > 0) size += static_cast<std::size_t>(count);
  }
  std::string words;
  for (std::size_t i = 0; i < size; ++i) {
    const bool shows = text[i] > ' ' && text[i] <= '~';
    if (shows) words += text[i];
    if (!shows && !words.empty() && words.back() != ' ') words += ' ';
  }
  if (!words.empty() && words.back() == ' ') words.pop_back();
  return words;
}

}  // namespace ironmoat::process
