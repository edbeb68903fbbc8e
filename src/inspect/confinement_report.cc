#include "inspect/confinement_report.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdint>
#include <cstring>
#include <iomanip>
#include <string_view>

#include "client/service_process.h"
#include "confinement/confinement.h"
#include "frames/frame.h"
#include "frames/frame_assembler.h"

namespace ironmoat::inspect {

namespace {

using namespace std::chrono_literals;

constexpr int kTimeToGreet = 2000;  // milliseconds
constexpr unsigned kTimeToAct = 5;  // seconds
constexpr int kNameWidth = 40;
constexpr int kCannotConfine = 255;  // exit status of a child; no errno

/// What a system call does: negative with errno set when it fails.
using Act = long (*)();

constexpr std::string_view kKilled = "killed by SIGSYS";
constexpr std::string_view kNoFile = "fails with ENOENT";
constexpr std::string_view kNoMemory = "fails with ENOMEM";

struct ForbiddenAct {
  std::string_view what;
  std::string_view fate;
  Act attempt;
};

constexpr ForbiddenAct kForbiddenActs[] = {
    {"read a file", kNoFile, [] { return long{::open("/etc/passwd", O_RDONLY)}; }},
    {"create a file", kNoFile, [] { return long{::open("/tmp", O_TMPFILE | O_WRONLY, 0600)}; }},
    {"delete a file", kKilled, [] { return long{::unlink("/tmp/vesk-unpack.none")}; }},
    {"open a network connection", kKilled, [] { return long{::socket(AF_INET, SOCK_STREAM, 0)}; }},
    {"write to another descriptor", kKilled,
     [] {
       const iovec nothing = {};
       return static_cast<long>(::writev(STDERR_FILENO + 1, &nothing, 1));
     }},
    {"start a process", kKilled, [] { return ::syscall(SYS_clone, SIGCHLD, 0, 0, 0, 0); }},
    {"run a program", kKilled,
     [] {
       char* const nothing[] = {nullptr};
       return long{::execve("/bin/true", nothing, nothing)};
     }},
    {"signal another process", kKilled, [] { return long{::kill(1, 0)}; }},
    {"trace another process", kKilled, [] { return ::syscall(SYS_ptrace, 0, 0, 0, 0); }},
    {"map memory to execute", kKilled,
     [] {
       void* const code = ::mmap(nullptr, 4096, PROT_READ | PROT_WRITE | PROT_EXEC,
                                 MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
       return code == MAP_FAILED ? -1L : 0L;
     }},
    {"make code writable", kKilled,
     [] {
       auto* const code = reinterpret_cast<char*>(&::getpid);
       char* const page = code - reinterpret_cast<std::uintptr_t>(code) % 4096;
       return long{::mprotect(page, 4096, PROT_READ | PROT_WRITE)};
     }},
    {"raise a limit", kKilled,
     [] {
       const rlimit limit = {1, 1};
       return long{::setrlimit(RLIMIT_NOFILE, &limit)};
     }},
    {"take more memory than the limit", kNoMemory,
     [] {
       void* const memory = ::mmap(nullptr, confinement::kAddressSpace, PROT_READ | PROT_WRITE,
                                   MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
       return memory == MAP_FAILED ? -1L : 0L;
     }},
};

/// What comes of an act in a confined child.
std::string attempt(Act act) {
  const pid_t child = ::fork();
  if (child < 0) return "not tried: no child can be started";
  if (child == 0) {
    ::alarm(kTimeToAct);
    ::dup2(::open("/dev/null", O_WRONLY), STDERR_FILENO);  // the fate says it all
    try {
      confinement::confine();
    } catch (const confinement::CannotConfine&) {
      ::_exit(kCannotConfine);
    }
    ::_exit(act() < 0 ? errno : 0);
  }
  int status = 0;
  while (::waitpid(child, &status, 0) < 0) {
    if (errno != EINTR) return "not known: the child is lost";
  }
  if (WIFSIGNALED(status)) {
    const char* const name = ::sigabbrev_np(WTERMSIG(status));
    return std::string("killed by SIG") + (name == nullptr ? "?" : name);
  }
  const int error = WEXITSTATUS(status);
  if (error == 0) return "ALLOWED";
  if (error == kCannotConfine) return "not tried: the child cannot be confined";
  const char* const name = ::strerrorname_np(error);
  return std::string("fails with ") + (name == nullptr ? std::to_string(error) : name);
}

/// The service's first frame, or why there is none.
frames::Hello greetingOf(client::ServiceProcess& process) {
  frames::FrameAssembler assembler(frames::kMaxReplyBody, Sharing::anyThread);
  for (;;) {
    if (const auto body = assembler.next()) return frames::parseHello(*body);
    pollfd ready = {process.socket(), POLLIN, 0};
    const int count = ::poll(&ready, 1, kTimeToGreet);
    if (count < 0 && errno == EINTR) continue;
    if (count == 0) throw client::StartError("it does not greet", false);
    const auto room = assembler.room();
    const ssize_t came = ::recv(process.socket(), room.data(), room.size(), 0);
    if (came <= 0) throw client::StartError("it " + process.lastWord(100ms), false);
    assembler.commit(static_cast<std::size_t>(came));
  }
}

class Report {
 public:
  explicit Report(std::ostream& out) : out_(out) {}

  void line(std::string_view what, std::string_view fate, bool asItHasToBe = true) {
    out_ << "  " << std::left << std::setw(kNameWidth) << what << fate
         << (asItHasToBe ? "\n" : "  <-- NOT SAFE\n") << std::flush;
    if (!asItHasToBe) status_ = 1;
  }
  [[nodiscard]] int status() const noexcept { return status_; }

 private:
  std::ostream& out_;
  int status_ = 0;
};

}  // namespace

int selfTest(std::ostream& out, const std::string& serviceProgram) {
  std::uint32_t bits = 0;
  try {
    client::ServiceProcess process = client::ServiceProcess::start(serviceProgram);
    bits = greetingOf(process).confinement;
  } catch (const std::exception& error) {
    out << "No service from " << serviceProgram << ": " << error.what() << '\n';
    return 2;
  }

  Report report(out);
  out << "In force in " << serviceProgram << ":\n";
  for (const frames::ConfinementName& known : frames::kConfinementNames) {
    const auto bit = static_cast<std::uint32_t>(known.part);
    const bool required = (frames::kRequiredConfinement & bit) != 0;
    report.line(known.name, (bits & bit) != 0 ? "yes" : "no", (bits & bit) != 0 || !required);
  }
  if (frames::kSanitizedBuild) {
    out << "Nothing is tried: this is a sanitizer's build, which goes without the filter.\n";
    return report.status();
  }
  out << "Tried in a process confined by the same code:\n" << std::flush;
  for (const ForbiddenAct& act : kForbiddenActs) {
    const std::string fate = attempt(act.attempt);
    report.line(act.what, fate, fate == act.fate);
  }
  return report.status();
}

}  // namespace ironmoat::inspect
