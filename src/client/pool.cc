#include "client/pool.h"

#include <utility>

namespace ironmoat::client {

void Pool::run(std::shared_ptr<Request> request) {
  const Request& own = *request;
  Lease lease = leaseFor({std::move(request)});
  Connection& connection = lease.front().connection;
  while (!own.isDone()) {
    connection.wait();
    connection.pull();
    connection.push();
  }
  connection.channel().finished().clear();
  connection.renew();
  giveBack(std::move(lease));
}

void Pool::end() noexcept {
  const Lock lock(mutex_);
  idle_.clear();
}

/// A connection that the request has been added to. A new connection is made under the lock:
/// whoever then finds all in use waits for one that there is.
Pool::Lease Pool::leaseFor(RequestList request) {
  Lease lease;
  Lock lock(mutex_);
  if (idle_.empty() && made_ == context_.settings.processes) {
    Waiter self{std::move(request)};
    waiters_.push_back(&self);
    while (self.lease.empty()) lock.waitUntil(self.ready, TimePoint::max());
    return std::move(self.lease);
  }
  if (idle_.empty()) {
    lease.emplace_back(context_);
    ++made_;
  } else {
    lease.splice(lease.end(), idle_, idle_.begin());
  }
  lock.unlock();
  begin(lease, std::move(request));
  return lease;
}

void Pool::begin(Lease& lease, RequestList request) noexcept {
  Connection& connection = lease.front().connection;
  connection.pull();  // first: nothing that came before the request is its reply
  connection.channel().add(std::move(request), Clock::now());
  connection.push();
}

void Pool::giveBack(Lease lease) noexcept {
  const TimePoint now = lease.front().usedAt = Clock::now();
  Lease unused;  // its process ends after the lock is released
  Lock lock(mutex_);
  if (!waiters_.empty()) {
    Waiter& next = *waiters_.front();
    waiters_.pop_front();
    lock.unlock();
    begin(lease, std::move(next.request));
    lock.lock();
    next.lease = std::move(lease);
    next.ready.notify_one();
    return;
  }
  idle_.splice(idle_.begin(), lease);
  if (idle_.size() > 1 && now - idle_.back().usedAt >= context_.settings.idleTime) {
    unused.splice(unused.end(), idle_, std::prev(idle_.end()));
    --made_;
  }
}

}  // namespace ironmoat::client
