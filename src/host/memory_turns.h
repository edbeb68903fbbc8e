#pragma once

#include <condition_variable>
#include <mutex>

namespace ironmoat::host {

/// All requests share one limit on memory. One that runs into it is tried again with the memory to
/// itself, so that what it gets depends on its own bytes only.
///
/// Held with std::shared_lock together with others and with std::unique_lock alone. Unlike
/// std::shared_mutex it lets nobody else in once somebody waits to be alone.
class MemoryTurns {
 public:
  void lock_shared() {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return !alone_; });
    ++holders_;
  }
  void unlock_shared() {
    const std::lock_guard lock(mutex_);
    --holders_;
    if (alone_) changed_.notify_all();
  }
  void lock() {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return !alone_; });
    alone_ = true;
    changed_.wait(lock, [this] { return holders_ == 0; });
  }
  void unlock() {
    const std::lock_guard lock(mutex_);
    alone_ = false;
    changed_.notify_all();
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  unsigned holders_ = 0;
  bool alone_ = false;  // wanted or had by one
};

}  // namespace ironmoat::host
