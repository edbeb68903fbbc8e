#pragma once

#include <condition_variable>
#include <cstddef>
#include <list>
#include <memory>

#include "client/connection.h"
#include "client/mutex.h"

namespace ironmoat::client {

/// The connections that calling threads lease, one call at a time. Thread-safe.
///
/// A lease gets the connection that was used last; a new one while all are in use, up to
/// `Settings::processes`; else it waits its turn, first come first served. The thread that gives a
/// connection back sends the request of the first that waits, so that the process works while the
/// other thread wakes.
///
/// Invariants: every connection is either in `idle_` or leased; nobody waits while `idle_` has one.
class Pool {
 public:
  explicit Pool(Context& context) : context_(context) {}

  /// Runs the request to its outcome on this thread. Throws std::bad_alloc; the request then has no
  /// outcome.
  void run(std::shared_ptr<Request> request);
  /// Ends the processes; no call may be under way.
  void end() noexcept;

 private:
  struct Member {
    explicit Member(Context& context) : connection(context) {}
    Connection connection;
    TimePoint usedAt;
  };
  using Lease = std::list<Member>;  // of one, since a node moves without memory
  /// On the stack of a thread that waits for a connection. Guarded by mutex_.
  struct Waiter {
    RequestList request;
    Lease lease{};
    std::condition_variable ready{};
  };

  Lease leaseFor(RequestList request);
  void giveBack(Lease lease) noexcept;
  static void begin(Lease& lease, RequestList request) noexcept;

  Context& context_;
  Mutex mutex_;
  Lease idle_ IRONMOAT_GUARDED_BY(mutex_);            // the one used last is the first
  std::size_t made_ IRONMOAT_GUARDED_BY(mutex_) = 0;  // connections there are
  std::list<Waiter*> waiters_ IRONMOAT_GUARDED_BY(mutex_);
};

}  // namespace ironmoat::client
