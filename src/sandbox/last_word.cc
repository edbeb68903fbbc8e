#include "sandbox/last_word.h"

#include <sys/syscall.h>  // for system_call_names.inc
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <csignal>
#include <iterator>
#include <string_view>

namespace ironmoat::sandbox {

namespace {

struct SystemCall {
  int number;
  std::string_view name;
};
constexpr SystemCall kSystemCalls[] = {
#include "system_call_names.inc"
};

constexpr int kByFilter = 1;  // SYS_SECCOMP, which glibc's headers lack

/// Signal handler: async-signal-safe, uses neither locks nor the heap.
void nameCall(int /*signal*/, siginfo_t* info, void* /*context*/) {
  if (info->si_code != kByFilter) return;
  constexpr std::string_view kWords = "forbidden system call ";
  char text[80];
  char* end = std::copy(kWords.begin(), kWords.end(), text);
  end = std::to_chars(end, end + 12, info->si_syscall).ptr;
  const auto* const known =
      std::find_if(std::begin(kSystemCalls), std::end(kSystemCalls),
                   [&](const SystemCall& call) { return call.number == info->si_syscall; });
  if (known != std::end(kSystemCalls)) {
    constexpr std::size_t kMaxName = 32;
    *end++ = ' ';
    *end++ = '(';
    end = std::copy_n(known->name.begin(), std::min(known->name.size(), kMaxName), end);
    *end++ = ')';
  }
  *end++ = '\n';
  static_cast<void>(!::write(STDERR_FILENO, text, static_cast<std::size_t>(end - text)));
  // To return is another forbidden call, rt_sigreturn. SA_RESETHAND has removed this handler, so
  // that call kills the process.
}

}  // namespace

void nameForbiddenCall() noexcept {
  struct sigaction action = {};
  action.sa_sigaction = &nameCall;
  action.sa_flags = SA_SIGINFO | static_cast<int>(SA_RESETHAND);
  ::sigfillset(&action.sa_mask);  // SIGPIPE and SIGXFSZ must not replace SIGSYS
  ::sigaction(SIGSYS, &action, nullptr);
}

}  // namespace ironmoat::sandbox
