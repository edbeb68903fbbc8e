#pragma once

#include <sys/mman.h>
#include <sys/types.h>
#include <unistd.h>

#include <atomic>
#include <new>

namespace ironmoat::client {

/// Tells the process that set the mark from copies that fork() makes of it. By a page that the
/// kernel wipes in a copy, for asking it who we are takes a tenth of the time that submitting a
/// request does; by asking, where it cannot wipe.
class ForkMark {
 public:
  ForkMark() noexcept = default;
  ForkMark(const ForkMark&) = delete;
  ForkMark& operator=(const ForkMark&) = delete;
  ~ForkMark() {
    if (page_ != nullptr) ::munmap(page_, 1);
  }

  [[nodiscard]] bool isSet() const noexcept { return owner_.load(std::memory_order_relaxed) != 0; }
  /// Once, by one thread.
  void set() noexcept {
    owner_.store(::getpid(), std::memory_order_relaxed);
    void* const page =
        ::mmap(nullptr, 1, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (page == MAP_FAILED) return;
    if (::madvise(page, 1, MADV_WIPEONFORK) == 0) {
      page_.store(new (page) Page(true), std::memory_order_release);
    } else {
      ::munmap(page, 1);
    }
  }
  [[nodiscard]] bool inCopy() const noexcept {
    if (const Page* const page = page_.load(std::memory_order_acquire)) return !page->load();
    const pid_t owner = owner_.load(std::memory_order_relaxed);
    return owner != 0 && owner != ::getpid();
  }

 private:
  using Page = std::atomic<bool>;

  std::atomic<pid_t> owner_{0};
  std::atomic<Page*> page_ = nullptr;
};

}  // namespace ironmoat::client
