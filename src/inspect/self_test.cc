#include "inspect/self_test.h"

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

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "process/service_process.h"
#include "sandbox/sandbox.h"

namespace ironmoat::inspect {

namespace {

using namespace std::chrono_literals;

constexpr int kHelloTimeout = 2000;     // milliseconds
constexpr unsigned kActionTimeout = 5;  // seconds
constexpr int kNoSandbox = 255;         // exit status of a child; not an errno

/// Makes a system call. Returns a negative number and sets errno if it fails.
using Action = long (*)();

constexpr std::string_view kKilled = "killed by SIGSYS";
constexpr std::string_view kNoFile = "fails with ENOENT";
constexpr std::string_view kNoMemory = "fails with ENOMEM";

struct ForbiddenAction {
  std::string_view name;
  std::string_view result;
  Action perform;
};

constexpr ForbiddenAction kForbidden[] = {
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
       void* const memory = ::mmap(nullptr, sandbox::kAddressSpace, PROT_READ | PROT_WRITE,
                                   MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
       return memory == MAP_FAILED ? -1L : 0L;
     }},
};

/// The result of an action in a sandboxed child.
std::string resultOf(Action perform) {
  const pid_t child = ::fork();
  if (child < 0) return "not tried: cannot start a child";
  if (child == 0) {
    ::alarm(kActionTimeout);
    ::dup2(::open("/dev/null", O_WRONLY), STDERR_FILENO);  // discards the filter's line
    try {
      sandbox::enter();
    } catch (const sandbox::Unavailable&) {
      ::_exit(kNoSandbox);
    }
    ::_exit(perform() < 0 ? errno : 0);
  }
  int status = 0;
  while (::waitpid(child, &status, 0) < 0) {
    if (errno != EINTR) return "unknown: the child's status is lost";
  }
  if (WIFSIGNALED(status)) {
    const char* const name = ::sigabbrev_np(WTERMSIG(status));
    return std::string("killed by SIG") + (name == nullptr ? "?" : name);
  }
  const int error = WEXITSTATUS(status);
  if (error == 0) return "ALLOWED";
  if (error == kNoSandbox) return "not tried: cannot sandbox the child";
  const char* const name = ::strerrorname_np(error);
  return std::string("fails with ") + (name == nullptr ? std::to_string(error) : name);
}

/// The service's first frame. Throws StartError if there is none, FrameError if it is not valid.
frames::Hello helloOf(process::ServiceProcess& process) {
  frames::FrameAssembler assembler(frames::kMaxReplyBody, Sharing::anyThread);
  for (;;) {
    if (const auto body = assembler.next()) return frames::parseHello(*body);
    pollfd ready = {process.socket(), POLLIN, 0};
    const int count = ::poll(&ready, 1, kHelloTimeout);
    if (count < 0 && errno == EINTR) continue;
    if (count == 0) throw process::StartError("it sent no hello within 2 s", false);
    const auto room = assembler.room();
    const ssize_t got = ::recv(process.socket(), room.data(), room.size(), 0);
    if (got <= 0) throw process::StartError("it " + process.lastWord(100ms), false);
    assembler.commit(static_cast<std::size_t>(got));
  }
}

}  // namespace

int selfTest(std::ostream& out, const std::string& serviceProgram) {
  std::uint32_t bits = 0;
  try {
    process::ServiceProcess process = process::ServiceProcess::start(serviceProgram);
    bits = helloOf(process).sandbox;
  } catch (const std::exception& error) {
    out << "cannot use " << serviceProgram << ": " << error.what() << '\n';
    return 2;
  }

  int status = 0;
  const auto line = [&](std::string_view name, std::string_view result, bool safe) {
    out << "  " << std::left << std::setw(40) << name << result
        << (safe ? "\n" : "  <-- NOT SAFE\n") << std::flush;
    if (!safe) status = 1;
  };
  out << "In force in " << serviceProgram << ":\n";
  for (const sandbox::PartDescription& known : sandbox::kParts) {
    const bool inForce = (bits & static_cast<std::uint32_t>(known.part)) != 0;
    line(known.name, inForce ? "yes" : "no", inForce || !isRequired(known.part));
  }
  if (sandbox::kSanitizedBuild) {
    out << "Nothing tried: a build with a sanitizer has no filter.\n";
    return status;
  }
  out << "Tried in a process with the same sandbox:\n" << std::flush;
  for (const ForbiddenAction& action : kForbidden) {
    const std::string result = resultOf(action.perform);
    line(action.name, result, result == action.result);
  }
  return status;
}

}  // namespace ironmoat::inspect
