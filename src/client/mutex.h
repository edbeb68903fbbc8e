#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>

/// std::mutex with the annotations by which clang checks, in the lint step, that what a mutex
/// guards is only touched under it.
#if defined(__clang__)
#define IRONMOAT_THREAD_ANNOTATION(x) __attribute__((x))
#else
#define IRONMOAT_THREAD_ANNOTATION(x)
#endif
#define IRONMOAT_GUARDED_BY(mutex) IRONMOAT_THREAD_ANNOTATION(guarded_by(mutex))
#define IRONMOAT_REQUIRES(mutex) IRONMOAT_THREAD_ANNOTATION(requires_capability(mutex))

namespace ironmoat::client {

class IRONMOAT_THREAD_ANNOTATION(capability("mutex")) Mutex {
 public:
  void lock() IRONMOAT_THREAD_ANNOTATION(acquire_capability()) { mutex_.lock(); }
  void unlock() IRONMOAT_THREAD_ANNOTATION(release_capability()) { mutex_.unlock(); }

 private:
  friend class Lock;
  std::mutex mutex_;
};

/// Holds the mutex for as long as it lives, but while it waits.
class IRONMOAT_THREAD_ANNOTATION(scoped_lockable) Lock {
 public:
  explicit Lock(Mutex& mutex) IRONMOAT_THREAD_ANNOTATION(acquire_capability(mutex))
      : lock_(mutex.mutex_) {}
  Lock(const Lock&) = delete;
  Lock& operator=(const Lock&) = delete;
  // NOLINTNEXTLINE(modernize-use-equals-default): what is defaulted has no annotation
  ~Lock() IRONMOAT_THREAD_ANNOTATION(release_capability()) {}

  void unlock() IRONMOAT_THREAD_ANNOTATION(release_capability()) { lock_.unlock(); }
  void lock() IRONMOAT_THREAD_ANNOTATION(acquire_capability()) { lock_.lock(); }
  /// Until time_point::max() is for ever.
  void waitUntil(std::condition_variable& condition, std::chrono::steady_clock::time_point until) {
    if (until == std::chrono::steady_clock::time_point::max()) {
      condition.wait(lock_);
    } else {
      condition.wait_until(lock_, until);
    }
  }

 private:
  std::unique_lock<std::mutex> lock_;
};

}  // namespace ironmoat::client
