#pragma once

/// ThreadSanitizer does not see atomic operations of code that was built without it. If the daemon
/// was built with it, these functions announce those of this library; otherwise they are null.
// NOLINTBEGIN(bugprone-reserved-identifier,readability-identifier-naming): the sanitizer's names
extern "C" void __tsan_acquire(void* at) __attribute__((weak));
extern "C" void __tsan_release(void* at) __attribute__((weak));
// NOLINTEND(bugprone-reserved-identifier,readability-identifier-naming)

namespace ironmoat::detail {

/// To be called before an operation on the atomic `at` with release semantics.
template <class Atomic>
void announceRelease(Atomic& at) noexcept {
  if (__tsan_release != nullptr) __tsan_release(static_cast<void*>(&at));
}
/// To be called after an operation with acquire semantics.
template <class Atomic>
void announceAcquire(Atomic& at) noexcept {
  if (__tsan_acquire != nullptr) __tsan_acquire(static_cast<void*>(&at));
}

}  // namespace ironmoat::detail
