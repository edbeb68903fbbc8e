#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <thread>

#include "client/engine.h"
#include "client/mutex.h"

namespace ironmoat::client {

/// A request that a SharedEngine runs. Any thread may ask `isDone`; the outcome belongs to whoever
/// has seen it true.
class SubmittedRequest : public Request {
 public:
  SubmittedRequest(std::string_view outputType, Data message, Clock::duration deadline,
                   bool hasCompletion = false) noexcept
      : Request(outputType, std::move(message), deadline), hasCompletion_(hasCompletion) {}
  [[nodiscard]] bool isDone() const noexcept { return done_.load(std::memory_order_acquire); }
  void deliver() noexcept override {}

 private:
  friend class SharedEngine;
  const bool hasCompletion_;        // `deliver` is to be called, on the engine's thread
  std::atomic<bool> done_ = false;  // stored with release when the outcome is there
};

/// An Engine that threads share. Thread-safe.
///
/// One thread at a time drives the engine: it sends what was submitted, receives, and publishes the
/// outcomes. Whoever waits for an outcome drives if nobody else does; so does whoever submits, for
/// as long as it takes to send. The engine's own thread, started by the first request, drives what
/// nobody has driven for kTick, and whenever a completion is to be called; it takes none of the
/// daemon's signals.
///
/// Invariant: while a request has no outcome, somebody drives, or will within kTick.
class SharedEngine {
 public:
  SharedEngine(const Settings& settings, Counters& counters)
      : settings_(settings), counters_(counters) {}
  SharedEngine(const SharedEngine&) = delete;
  SharedEngine& operator=(const SharedEngine&) = delete;
  ~SharedEngine() { stop(); }

  /// Waits while too many bytes are in flight, first come first served. Throws std::system_error
  /// when the thread cannot be started, and std::bad_alloc.
  void submit(std::shared_ptr<SubmittedRequest> request);
  /// Waits until the request is done, or until `until`; returns whether it is.
  bool await(const SubmittedRequest& request, TimePoint until);
  /// Completes a request that has its outcome without having been submitted.
  static void complete(SubmittedRequest& request) noexcept;
  void addTo(Stats& stats) noexcept;
  /// Every request fails with `unavailable`; leaves no thread and no process.
  void stop() noexcept;

 private:
  static constexpr auto kTick = std::chrono::milliseconds(10);

  /// A thread that waits for an outcome, or for room, and does not drive. In a list that takes no
  /// memory: a thread that failed to wait for its turn would hold up all that come after it.
  struct Waiter {
    const SubmittedRequest* request;  // null: for room
    std::condition_variable changed;
    Waiter* next;
  };

  void startThread() IRONMOAT_REQUIRES(mutex_);
  void run() noexcept;
  /// Drives once: waits until `until` for something to do, if nothing is. Requires that nobody
  /// drives.
  void drive(TimePoint until) noexcept IRONMOAT_REQUIRES(mutex_);
  /// Drives, or waits for whoever does.
  void driveOrWait(Lock& lock, const SubmittedRequest* request, TimePoint until)
      IRONMOAT_REQUIRES(mutex_);
  void publish(RequestList finished) noexcept IRONMOAT_REQUIRES(mutex_);
  /// Lets somebody who waits drive, now that nobody does.
  void passOn() noexcept IRONMOAT_REQUIRES(mutex_);
  [[nodiscard]] bool hasRoom(std::size_t bytes) const IRONMOAT_REQUIRES(mutex_);

  const Settings& settings_;
  Counters& counters_;
  std::unique_ptr<Engine> engine_;  // of the thread that drives
  FileDescriptor wake_;             // an eventfd in the engine's descriptor
  std::thread thread_;

  Mutex mutex_;
  RequestList submitted_ IRONMOAT_GUARDED_BY(mutex_);
  std::size_t submittedCount_ IRONMOAT_GUARDED_BY(mutex_) = 0;
  std::size_t worthSending_ IRONMOAT_GUARDED_BY(mutex_) = 1;  // so many are
  bool driven_ IRONMOAT_GUARDED_BY(mutex_) = false;
  bool asleep_ IRONMOAT_GUARDED_BY(mutex_) = false;  // whoever drives waits for the descriptor
  bool stopping_ IRONMOAT_GUARDED_BY(mutex_) = false;
  std::uint64_t drives_ IRONMOAT_GUARDED_BY(mutex_) = 0;
  Waiter* firstWaiter_ IRONMOAT_GUARDED_BY(mutex_) = nullptr;  // the one that came first
  RequestList completed_ IRONMOAT_GUARDED_BY(mutex_);          // to be delivered by the thread
  std::size_t completions_ IRONMOAT_GUARDED_BY(mutex_) = 0;    // in flight
  std::condition_variable threadWakes_;

  std::size_t inFlight_ IRONMOAT_GUARDED_BY(mutex_) = 0;
  std::size_t bytesInFlight_ IRONMOAT_GUARDED_BY(mutex_) = 0;
  std::uint64_t nextTicket_ IRONMOAT_GUARDED_BY(mutex_) = 0;
  std::uint64_t admitted_ IRONMOAT_GUARDED_BY(mutex_) = 0;  // tickets below have been let in
};

}  // namespace ironmoat::client
