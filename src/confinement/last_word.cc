#include "confinement/last_word.h"

#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <csignal>
#include <iterator>
#include <string_view>

namespace ironmoat::confinement {

namespace {

struct SystemCall {
  int number;
  std::string_view name;
};
constexpr SystemCall kSystemCalls[] = {
#include "system_call_names.inc"
};

constexpr int kByFilter = 1;  // SYS_SECCOMP, which glibc's headers lack

/// Runs wherever the call was made, with locks held and the heap in any state: it uses neither.
void nameCallAndEnd(int /*signal*/, siginfo_t* info, void* /*context*/) {
  if (info->si_code != kByFilter) return;
  constexpr std::string_view kWords = "forbidden system call ";
  char text[80];
  char* end = std::copy(kWords.begin(), kWords.end(), text);
  end = std::to_chars(end, end + 12, info->si_syscall).ptr;
  const auto* const known =
      std::find_if(std::begin(kSystemCalls), std::end(kSystemCalls),
                   [&](const SystemCall& call) { return call.number == info->si_syscall; });
  if (known != std::end(kSystemCalls)) {
    constexpr std::size_t kLongestName = 32;
    *end++ = ' ';
    *end++ = '(';
    end = std::copy_n(known->name.begin(), std::min(known->name.size(), kLongestName), end);
    *end++ = ')';
  }
  *end++ = '\n';
  static_cast<void>(!::write(STDERR_FILENO, text, static_cast<std::size_t>(end - text)));
  // Another forbidden call, and no handler for it any more: the kernel unblocks the signal and
  // kills the process. Returning would let the first go on as if it had failed.
  for (;;) ::syscall(SYS_getppid);
}

}  // namespace

void nameForbiddenCall() noexcept {
  struct sigaction action = {};
  action.sa_sigaction = &nameCallAndEnd;
  action.sa_flags = SA_SIGINFO | static_cast<int>(SA_RESETHAND);
  ::sigfillset(&action.sa_mask);  // a closed pipe or a file as standard error is no other death
  ::sigaction(SIGSYS, &action, nullptr);
}

}  // namespace ironmoat::confinement
