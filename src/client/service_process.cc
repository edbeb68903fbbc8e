#include "client/service_process.h"

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

#include "frames/confinement_bits.h"

namespace ironmoat::client {

namespace {

constexpr std::size_t kMostWords = 400;
constexpr auto kPidfd = static_cast<idtype_t>(3);  // P_PIDFD, which older <sys/wait.h> lack

[[noreturn]] void throwStartError(const std::string& program, int error) {
  const bool passing =
      error == EAGAIN || error == ENOMEM || error == EMFILE || error == ENFILE || error == ETXTBSY;
  throw StartError("cannot start " + program + ": " + std::generic_category().message(error),
                   passing);
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
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK);
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

/// A pidfd of our child, or -1. Where the daemon lets its children be reaped by themselves, the id
/// may have passed to a stranger by now: a process that is no child of ours is not taken.
int pidfdOfChild(pid_t pid) noexcept {
  const int fd = static_cast<int>(::syscall(SYS_pidfd_open, pid, 0));
  siginfo_t info;
  if (fd >= 0 && ::waitid(kPidfd, static_cast<id_t>(fd), &info, WEXITED | WNOHANG | WNOWAIT) != 0) {
    ::close(fd);
    errno = ECHILD;
    return -1;
  }
  return fd;
}

std::string exitWord(int status) {
  std::string word = "exited with status " + std::to_string(status);
  if (const auto* const lack = frames::lackToldBy(status)) {
    word += " (this part of its confinement cannot be had: " + std::string(lack->name) + ")";
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
  // The end that is read does not wait; the service's does, so that abort's words come whole.
  if (::pipe2(ends, O_CLOEXEC) != 0) throwStartError(program, errno);
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
      ::fcntl(words.get(), F_SETFL, O_NONBLOCK) != 0) {
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

  const int pidfd = pidfdOfChild(pid);
  if (pidfd < 0) {
    const int reason = errno;
    if (reason != ECHILD) {  // ours still, and not yet reaped: the id is good
      ::kill(pid, SIGKILL);
      while (::waitpid(pid, nullptr, 0) < 0 && errno == EINTR) {
      }
    }
    throwStartError(program, reason);
  }
  return {std::move(ours), std::move(words), FileDescriptor(pidfd)};
}

ServiceProcess::ServiceProcess(FileDescriptor socket, FileDescriptor words,
                               FileDescriptor pidfd) noexcept
    : socket_(std::move(socket)), words_(std::move(words)), pidfd_(std::move(pidfd)) {}

ServiceProcess::~ServiceProcess() {
  if (!pidfd_) return;
  kill();
  siginfo_t info;
  while (::waitid(kPidfd, static_cast<id_t>(pidfd_.get()), &info, WEXITED) != 0 && errno == EINTR) {
  }
}

void ServiceProcess::kill() const noexcept {
  ::syscall(SYS_pidfd_send_signal, pidfd_.get(), SIGKILL, nullptr, 0);
}

bool ServiceProcess::endsWithin(std::chrono::milliseconds grace) const noexcept {
  pollfd ended = {pidfd_.get(), POLLIN, 0};
  int count = 0;
  do {
    count = ::poll(&ended, 1, static_cast<int>(grace.count()));
  } while (count < 0 && errno == EINTR);
  return count > 0;
}

std::string ServiceProcess::lastWord(std::chrono::milliseconds grace) {
  const bool byItself = endsWithin(grace);
  if (!byItself) kill();
  siginfo_t info = {};
  int result = 0;
  do {
    result = ::waitid(kPidfd, static_cast<id_t>(pidfd_.get()), &info, WEXITED);
  } while (result != 0 && errno == EINTR);
  pidfd_.reset();
  if (!byItself) return "closed its connection";
  // The daemon's own wait calls, or its ignoring SIGCHLD, can have taken the status.
  if (result != 0) return "ended, and its status is lost";
  std::string word;
  if (info.si_code == CLD_EXITED) {
    word = exitWord(info.si_status);
  } else {
    const char* name = ::sigabbrev_np(info.si_status);
    word = "was killed by ";
    word += name != nullptr ? std::string("SIG").append(name)
                            : std::string("signal ").append(std::to_string(info.si_status));
  }
  if (const std::string words = wordsOnStandardError(); !words.empty()) {
    word.append(" (").append(words).append(")");
  }
  return word;
}

std::string ServiceProcess::wordsOnStandardError() const {
  char text[kMostWords];
  const ssize_t size = ::read(words_.get(), text, sizeof text);
  std::string words;
  for (ssize_t i = 0; i < size; ++i) {
    const bool shows = text[i] > ' ' && text[i] <= '~';
    if (shows) words += text[i];
    if (!shows && !words.empty() && words.back() != ' ') words += ' ';
  }
  if (!words.empty() && words.back() == ' ') words.pop_back();
  return words;
}

}  // namespace ironmoat::client
