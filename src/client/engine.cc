#include "client/engine.h"

#include <sys/epoll.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <system_error>
#include <utility>

namespace ironmoat::client {

Engine::Engine(const Settings& settings, Counters& counters)
    : settings_(settings), counters_(counters), epoll_(::epoll_create1(EPOLL_CLOEXEC)) {
  if (!epoll_) throw std::system_error(errno, std::generic_category(), "epoll_create1");
  members_.reserve(settings.processes);
}

void Engine::cancel(Request& request) noexcept {
  for (Request* each = waiting_.front(); each != nullptr; each = RequestList::after(*each)) {
    if (each != &request) continue;
    counters_.add(&Stats::cancelled);
    return finished_.push(waiting_.remove(request));
  }
  const TimePoint now = Clock::now();
  for (const Member& member : members_) member.connection->channel().cancel(request, now);
}

TimePoint Engine::wakeAt() const noexcept {
  const bool canMove = members_.size() < settings_.processes ||
                       std::any_of(members_.begin(), members_.end(), [](const Member& each) {
                         return each.connection->channel().empty();
                       });
  TimePoint at = waiting_.empty() || !canMove ? TimePoint::max() : TimePoint();
  for (const Member& member : members_) {
    const Channel& channel = member.connection->channel();
    at = std::min(at, channel.wakeAt());
    if (canMove && channel.size() > 1) at = std::min(at, channel.stalledAt(kPatience));
    if (members_.size() > 1 && channel.empty()) {
      at = std::min(at, member.usedAt + settings_.idleTime);
    }
  }
  return at;
}

std::size_t Engine::worthAdding() const noexcept {
  std::size_t inFlight = 0;
  std::size_t unsent = 0;
  for (const Member& member : members_) {
    const Channel& channel = member.connection->channel();
    inFlight += channel.inFlight();
    unsent += channel.size() - channel.inFlight();
  }
  return inFlight / 2 > unsent ? inFlight / 2 - unsent : 1;
}

void Engine::wait(int milliseconds) noexcept {
  std::array<epoll_event, 16> events;
  // With several processes whichever answers first counts, and a spin would look at one.
  if (milliseconds != 0 && members_.size() == 1 && members_.front().connection->spin()) return;
  const int count = ::epoll_wait(epoll_.get(), events.data(), events.size(), milliseconds);
  for (int i = 0; i < count; ++i) {
    if (auto* const ended = static_cast<Connection*>(events[i].data.ptr)) ended->processEnded();
  }
}

void Engine::step() noexcept {
  const TimePoint now = Clock::now();
  for (Member& member : members_) {
    Connection& connection = *member.connection;
    Channel& channel = connection.channel();
    connection.pull();
    finished_.append(std::move(channel.finished()));
    if (channel.empty()) {
      if (channel.isClosed()) connection.dismiss();
      connection.renew();
    } else if (channel.size() > 1 && now >= channel.stalledAt(kPatience)) {
      moveFollowers(connection, now);
    }
  }
  dispatch(now);
  for (Member& member : members_) {
    member.connection->push();
    finished_.append(std::move(member.connection->channel().finished()));
  }
  endIdle(now);
}

void Engine::dispatch(TimePoint now) noexcept {
  while (Request* const request = waiting_.front()) {
    Member* const member = memberFor(*request, now);
    if (member == nullptr) return;
    member->usedAt = now;
    member->hasLarge = isLarge(*request);
    member->connection->channel().add(waiting_.pop(), now);
  }
}

bool Engine::takes(const Member& member, const Request& request, TimePoint now) noexcept {
  const Channel& channel = member.connection->channel();
  if (channel.isClosed() || channel.isRetrying() || member.connection->wantsRest(now)) return false;
  if (channel.empty()) return true;
  return !member.hasLarge && !isLarge(request) && !request.isRetried() &&
         channel.size() < Channel::kWindow && now < channel.stalledAt(kPatience);
}

Engine::Member* Engine::memberFor(const Request& request, TimePoint now) noexcept {
  for (Member& member : members_) {
    if (takes(member, request, now)) return &member;
  }
  if (members_.size() == settings_.processes) return nullptr;
  try {
    members_.push_back(
        {std::make_unique<Connection>(settings_, counters_, epoll_.get()), now, false});
    return &members_.back();
  } catch (const std::bad_alloc&) {
    if (!members_.empty()) return nullptr;  // there will be room in one that there is
    fail(waiting_.pop(), std::bad_alloc());
    return nullptr;
  }
}

/// The requests behind the front of `connection` go first to the others, where one takes them.
void Engine::moveFollowers(Connection& connection, TimePoint now) noexcept {
  const Request& follower = *RequestList::after(*connection.channel().front());
  if (memberFor(follower, now) == nullptr) return;
  RequestList moved = connection.channel().takeFollowers();
  moved.append(std::move(waiting_));
  waiting_.append(std::move(moved));
}

void Engine::endIdle(TimePoint now) noexcept {
  for (auto member = members_.begin(); member != members_.end() && members_.size() > 1;) {
    const bool idle =
        member->connection->channel().empty() && now - member->usedAt >= settings_.idleTime;
    member = idle ? members_.erase(member) : member + 1;
  }
}

void Engine::stop(std::string_view why) noexcept {
  for (Member& member : members_) {
    Channel& channel = member.connection->channel();
    member.connection->dismiss();
    channel.failAll(why);
    finished_.append(std::move(channel.finished()));
  }
  members_.clear();
  while (!waiting_.empty()) {
    fail(waiting_.pop(), serviceError(ServiceError::Kind::unavailable, why));
  }
}

void Engine::fail(std::shared_ptr<Request> request, Failure failure) noexcept {
  counters_.count(&failure);
  request->fail(std::move(failure));
  finished_.push(std::move(request));
}

}  // namespace ironmoat::client
