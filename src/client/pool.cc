#include "client/pool.h"

#include <utility>

namespace ironmoat::client {

Pool::Pool(const Settings& settings, Counters& counters)
    : settings_(settings), counters_(counters) {
  idle_.reserve(settings.processes);  // giving back takes no memory
}

void Pool::run(std::shared_ptr<Request> request) {
  std::unique_ptr<Connection> connection = leaseFor(std::move(request));
  Channel& channel = connection->channel();
  while (channel.finished().empty()) {
    connection->wait();
    connection->pull();
    connection->push();
  }
  RequestList finished(std::move(channel.finished()));
  connection->renew();
  giveBack(std::move(connection));
  finished.deliverAll();
}

void Pool::end() noexcept {
  Lock lock(mutex_);
  idle_.clear();
}

std::unique_ptr<Connection> Pool::leaseFor(std::shared_ptr<Request> request) {
  std::unique_ptr<Connection> connection = takeIdle();
  if (connection == nullptr) {
    Waiter self;
    self.request = std::move(request);
    Lock lock(mutex_);
    if (idle_.empty()) {
      (lastWaiter_ == nullptr ? firstWaiter_ : lastWaiter_->next) = &self;
      lastWaiter_ = &self;
      while (self.connection == nullptr) lock.wait(self.ready);
      return std::move(self.connection);
    }
    connection = std::move(idle_.back().connection);  // given back meanwhile
    idle_.pop_back();
    request = std::move(self.request);
  }
  begin(*connection, std::move(request));
  return connection;
}

/// The connection used last, or a new one; null when all are in use. A new one is made under the
/// lock: whoever finds all in use then waits for one that there is.
std::unique_ptr<Connection> Pool::takeIdle() {
  Lock lock(mutex_);
  if (!idle_.empty()) {
    std::unique_ptr<Connection> connection = std::move(idle_.back().connection);
    idle_.pop_back();
    return connection;
  }
  if (made_ == settings_.processes) return nullptr;
  auto connection = std::make_unique<Connection>(settings_, counters_);
  ++made_;
  return connection;
}

void Pool::begin(Connection& connection, std::shared_ptr<Request> request) noexcept {
  connection.pull();  // first: nothing that came before the request is its reply
  connection.channel().add(std::move(request), Clock::now());
  connection.push();
}

void Pool::giveBack(std::unique_ptr<Connection> connection) noexcept {
  const TimePoint now = Clock::now();
  std::unique_ptr<Connection> unused;  // its process ends without the lock
  Waiter* waiter = nullptr;
  {
    Lock lock(mutex_);
    waiter = std::exchange(firstWaiter_, firstWaiter_ == nullptr ? nullptr : firstWaiter_->next);
    if (firstWaiter_ == nullptr) lastWaiter_ = nullptr;
    if (waiter == nullptr) {
      idle_.push_back({std::move(connection), now});
      if (idle_.size() > 1 && now - idle_.front().since >= settings_.idleTime) {
        unused = std::move(idle_.front().connection);
        idle_.erase(idle_.begin());
        --made_;
      }
      return;
    }
  }
  begin(*connection, std::move(waiter->request));
  Lock lock(mutex_);
  waiter->connection = std::move(connection);
  waiter->ready.notify_one();
}

}  // namespace ironmoat::client
