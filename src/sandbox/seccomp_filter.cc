#include "sandbox/seccomp_filter.h"

#include <seccomp.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <ctime>
#include <initializer_list>

#include "sandbox/last_word.h"

namespace ironmoat::sandbox {

namespace {

using Argument = scmp_arg_cmp;

constexpr std::uint64_t kInt = 0xFFFFFFFF;  // bits of an int, sign-extended or not
constexpr std::uint64_t kAll = ~std::uint64_t{0};

constexpr Argument is(unsigned index, std::uint64_t value) {
  return {index, SCMP_CMP_EQ, value, 0};
}
constexpr Argument atMost(unsigned index, std::uint64_t value) {
  return {index, SCMP_CMP_LE, value, 0};
}
/// The argument equals `value` in the bits of `mask`.
constexpr Argument has(unsigned index, std::uint64_t mask, std::uint64_t value) {
  return {index, SCMP_CMP_MASKED_EQ, mask, value};
}

class Filter {
 public:
  /// Without a rule a call raises SIGSYS before it has any effect.
  Filter() noexcept : context_(::seccomp_init(SCMP_ACT_TRAP)) {
    if (context_ == nullptr) {
      error_ = ENOSYS;
      return;
    }
    // By default, calls by the numbers of another architecture kill the thread only.
    check(::seccomp_attr_set(context_, SCMP_FLTATR_ACT_BADARCH, SCMP_ACT_KILL_PROCESS));
  }
  Filter(const Filter&) = delete;
  Filter& operator=(const Filter&) = delete;
  ~Filter() {
    if (context_ != nullptr) ::seccomp_release(context_);
  }

  void allow(int call, std::initializer_list<Argument> arguments = {}) noexcept {
    rule(SCMP_ACT_ALLOW, call, arguments);
  }
  void answer(int call, std::uint16_t error) noexcept { rule(SCMP_ACT_ERRNO(error), call, {}); }
  /// 0, or the first error of any member function.
  [[nodiscard]] int load() noexcept {
    if (error_ == 0) check(::seccomp_load(context_));
    return error_;
  }

 private:
  void rule(std::uint32_t action, int call, std::initializer_list<Argument> arguments) noexcept {
    if (error_ != 0) return;
    check(::seccomp_rule_add_exact_array(
        context_, action, call, static_cast<unsigned>(arguments.size()), arguments.begin()));
  }
  void check(int result) noexcept {
    if (error_ == 0 && result != 0) error_ = -result;
  }

  scmp_filter_ctx context_;
  int error_ = 0;
};

}  // namespace

bool filterSystemCalls() noexcept {
  nameForbiddenCall();  // stays installed: the filter forbids sigaction
  Filter filter;
  // Requests, replies, last words. To wait for non-blocking descriptors takes pselect: poll rejects
  // all descriptors under an open-files limit of 0.
  filter.allow(SCMP_SYS(read), {is(0, STDIN_FILENO)});
  filter.allow(SCMP_SYS(writev), {is(0, STDOUT_FILENO)});
  filter.allow(SCMP_SYS(writev), {is(0, STDERR_FILENO)});
  filter.allow(SCMP_SYS(write), {is(0, STDERR_FILENO)});
  filter.allow(SCMP_SYS(pselect6), {atMost(0, STDOUT_FILENO + 1)});

  // Memory: private, anonymous, never executable.
  filter.allow(SCMP_SYS(brk));
  filter.allow(SCMP_SYS(mmap), {has(2, kAll & ~std::uint64_t{PROT_READ | PROT_WRITE}, 0),
                                has(3, kInt, MAP_PRIVATE | MAP_ANONYMOUS), has(4, kInt, kInt)});
  filter.allow(SCMP_SYS(mremap), {is(3, MREMAP_MAYMOVE)});
  filter.allow(SCMP_SYS(munmap));
  filter.allow(SCMP_SYS(madvise), {is(2, MADV_DONTNEED)});

  filter.allow(SCMP_SYS(clock_gettime), {atMost(0, CLOCK_BOOTTIME)});
  filter.allow(SCMP_SYS(restart_syscall));  // resumes a wait after SIGSTOP and SIGCONT

  // The end, by exit and by abort(). No futex: the process has one thread.
  filter.allow(SCMP_SYS(exit_group));
  filter.allow(SCMP_SYS(rt_sigprocmask));
  filter.allow(SCMP_SYS(getpid));
  filter.allow(SCMP_SYS(gettid));
  filter.allow(SCMP_SYS(tgkill), {is(0, static_cast<std::uint64_t>(::getpid())), is(2, SIGABRT)});

  // glibc works without the files that it looks for.
  filter.answer(SCMP_SYS(openat), ENOENT);

  errno = filter.load();
  return errno == 0;
}

}  // namespace ironmoat::sandbox
