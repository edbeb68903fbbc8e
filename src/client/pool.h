#pragma once

#include <condition_variable>
#include <cstddef>
#include <memory>
#include <vector>

#include "client/connection.h"
#include "client/mutex.h"
#include "client/settings.h"

namespace ironmoat::client {

/// The connections that calling threads lease, one call at a time. Thread-safe.
///
/// A lease gets the connection that was used last; a new one while all are in use, up to
/// `Settings::processes`; else it waits its turn, first come first served. Whoever gives a
/// connection back sends the request of the first that waits, so that its process works while that
/// thread wakes.
///
/// Invariants: every connection is either in `idle_` or leased; nobody waits while `idle_` has one.
class Pool {
 public:
  Pool(const Settings& settings, Counters& counters);

  /// Runs the request to its outcome on this thread. Throws std::bad_alloc, the request being
  /// without an outcome then.
  void run(std::shared_ptr<Request> request);
  /// Ends the processes; no call may be under way.
  void end() noexcept;

 private:
  struct Idle {
    std::unique_ptr<Connection> connection;
    TimePoint since;
  };
  /// A thread that waits for a connection. Lives on its stack; guarded by mutex_.
  struct Waiter {
    std::shared_ptr<Request> request;
    std::condition_variable ready;
    std::unique_ptr<Connection> connection;
    Waiter* next = nullptr;
  };

  /// A connection to which the request has been added.
  std::unique_ptr<Connection> leaseFor(std::shared_ptr<Request> request);
  std::unique_ptr<Connection> takeIdle();
  void giveBack(std::unique_ptr<Connection> connection) noexcept;
  static void begin(Connection& connection, std::shared_ptr<Request> request) noexcept;

  const Settings& settings_;
  Counters& counters_;
  Mutex mutex_;
  std::vector<Idle> idle_ IRONMOAT_GUARDED_BY(mutex_);  // the one used last is the last
  std::size_t made_ IRONMOAT_GUARDED_BY(mutex_) = 0;    // connections there are
  Waiter* firstWaiter_ IRONMOAT_GUARDED_BY(mutex_) = nullptr;
  Waiter* lastWaiter_ IRONMOAT_GUARDED_BY(mutex_) = nullptr;
};

}  // namespace ironmoat::client
