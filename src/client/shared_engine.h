#pragma once

#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <thread>

#include "client/engine.h"
#include "client/mutex.h"

namespace ironmoat::client {

/// An Engine that threads share. Thread-safe.
///
/// One thread at a time drives the engine: it waits for replies and completes the requests. A
/// thread that waits for an outcome drives if no other does. The engine's own thread, started by
/// the first request, drives what nobody has driven for kTick, and whenever a completion is to be
/// called; it takes none of the daemon's signals. Whoever submits sends, if that is worth it.
///
/// Invariant: while a request has no outcome, some thread drives, or will within kTick.
class SharedEngine {
 public:
  explicit SharedEngine(Context& context) : context_(context) {}
  SharedEngine(const SharedEngine&) = delete;
  SharedEngine& operator=(const SharedEngine&) = delete;
  ~SharedEngine() { stop(); }

  /// Of a request that is done already the completion is called, on the engine's thread.
  /// Waits while too many bytes are in flight, first come first served. Throws ServiceError when
  /// the thread cannot be started or the client is being destroyed, and std::bad_alloc; the request
  /// then has no outcome.
  void submit(std::shared_ptr<Request> request);
  /// Waits until the request is done, or until `until`; returns whether it is.
  bool await(const Request& request, TimePoint until) noexcept;
  /// Every request fails with `unavailable`; leaves no thread and no process.
  void stop() noexcept;

 private:
  /// How long a thread waits before it looks whether it has to take over, or the deadline of a new
  /// request is the next.
  static constexpr auto kTick = std::chrono::milliseconds(10);

  void startThread() IRONMOAT_REQUIRES(mutex_);
  void run() noexcept;
  /// Sends and receives what there is; if that completes no request, waits until `until`.
  void drive(TimePoint until) noexcept IRONMOAT_REQUIRES(mutex_);
  void driveOrWait(Lock& lock, TimePoint until) noexcept IRONMOAT_REQUIRES(mutex_);
  /// Both return whether any request was completed.
  bool step(Engine::Seen seen) noexcept IRONMOAT_REQUIRES(mutex_);
  bool publish() noexcept IRONMOAT_REQUIRES(mutex_);
  [[nodiscard]] bool hasRoom(std::size_t bytes) const noexcept IRONMOAT_REQUIRES(mutex_);

  Context& context_;
  Mutex mutex_;
  std::condition_variable changed_;      // requests were completed, or nobody drives any more
  std::condition_variable threadWakes_;  // there is something for the thread
  std::unique_ptr<Engine> engine_ IRONMOAT_GUARDED_BY(mutex_);
  std::thread thread_ IRONMOAT_GUARDED_BY(mutex_);
  frames::Spin spin_;  // the driving thread's
  bool driven_ IRONMOAT_GUARDED_BY(mutex_) = false;
  bool stopping_ IRONMOAT_GUARDED_BY(mutex_) = false;
  std::size_t waiters_ IRONMOAT_GUARDED_BY(mutex_) = 0;  // threads that will drive next
  std::uint64_t steps_ IRONMOAT_GUARDED_BY(mutex_) = 0;
  std::size_t inFlight_ IRONMOAT_GUARDED_BY(mutex_) = 0;       // requests
  std::size_t bytesInFlight_ IRONMOAT_GUARDED_BY(mutex_) = 0;  // with kOverhead for each
  std::size_t completions_ IRONMOAT_GUARDED_BY(mutex_) = 0;    // in flight, to be called
  RequestList completed_ IRONMOAT_GUARDED_BY(mutex_);          // whose completion is to be called
  // Threads that wait for room are served in the order of their tickets.
  std::uint64_t nextTicket_ IRONMOAT_GUARDED_BY(mutex_) = 0;
  std::uint64_t admitted_ IRONMOAT_GUARDED_BY(mutex_) = 0;
};

}  // namespace ironmoat::client
