#include "client/engine.h"

#include <sys/epoll.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <system_error>
#include <utility>

namespace ironmoat::client {

Engine::Engine(Context& context) : context_(context), epoll_(::epoll_create1(EPOLL_CLOEXEC)) {
  if (!epoll_) throw std::system_error(errno, std::generic_category(), "epoll_create1");
}

TimePoint Engine::wakeAt() const noexcept {
  const bool canMove = members_.size() < context_.settings.processes ||
                       std::any_of(members_.begin(), members_.end(),
                                   [](const Member& each) { return each.channel().empty(); });
  TimePoint at = waiting_.empty() || !canMove ? TimePoint::max() : TimePoint();
  for (const Member& member : members_) {
    const Channel& channel = member.channel();
    at = std::min(at, channel.wakeAt());
    if (canMove && channel.size() > 1) at = std::min(at, channel.stalledAt(kPatience));
    if (members_.size() > 1 && channel.empty()) {
      at = std::min(at, member.usedAt + context_.settings.idleTime);
    }
  }
  return at;
}

bool Engine::isWorthSending() const noexcept {
  std::size_t inFlight = 0;
  std::size_t unsent = waiting_.size();
  for (const Member& member : members_) {
    inFlight += member.channel().inFlight();
    unsent += member.channel().unsent();
  }
  return unsent >= inFlight / 2;
}

Engine::Seen Engine::wait(int milliseconds) const noexcept {
  std::array<epoll_event, 16> events;
  const int count = ::epoll_wait(epoll_.get(), events.data(), events.size(), milliseconds);
  Seen seen = Seen::nothing;
  for (int i = 0; i < count; ++i) {
    seen = std::max(seen, events[i].data.ptr == nullptr ? Seen::socket : Seen::endOfProcess);
  }
  return seen;
}

void Engine::step(Seen seen) noexcept {
  const TimePoint now = Clock::now();
  for (Member& member : members_) {
    Channel& channel = member.channel();
    member.connection.pull();
    if (seen == Seen::endOfProcess) member.connection.checkEnd();
    if (channel.empty() && channel.isClosed()) member.connection.dismiss();
    member.connection.renew();
    if (channel.size() > 1 && now >= channel.stalledAt(kPatience)) moveFollowers(channel, now);
  }
  dispatch(now);
  for (Member& member : members_) {
    member.connection.push();
    append(finished_, member.channel().finished());
  }
  endIdle(now);
}

void Engine::dispatch(TimePoint now) noexcept {
  while (!waiting_.empty()) {
    Request& request = *waiting_.front();
    if (request.isCancelled()) {
      request.drop();
      finished_.splice(finished_.end(), waiting_, waiting_.begin());
      continue;
    }
    Member* const member = memberFor(request, now);
    if (member == nullptr) return;
    member->usedAt = now;
    member->hasLarge = isLarge(request);
    member->channel().add(takeFirst(waiting_), now);
  }
}

bool Engine::takes(Member& member, const Request& request, TimePoint now) noexcept {
  const Channel& channel = member.channel();
  if (channel.isClosed() || channel.isRetrying() || member.connection.isYielding()) return false;
  return channel.empty() ||
         (!member.hasLarge && !isLarge(request) && !request.isRetried() &&
          channel.size() < Channel::kWindow && now < channel.stalledAt(kPatience));
}

Engine::Member* Engine::memberFor(const Request& request, TimePoint now) noexcept {
  for (Member& member : members_) {
    if (takes(member, request, now)) return &member;
  }
  if (members_.size() == context_.settings.processes) return nullptr;
  try {
    return &members_.emplace_back(context_, epoll_.get());
  } catch (const std::bad_alloc& error) {
    if (!members_.empty()) return nullptr;  // one that there is will take it
    waiting_.front()->fail(error);
    finished_.splice(finished_.end(), waiting_, waiting_.begin());
    return nullptr;
  }
}

/// The requests behind the front go first to the others, where one takes them.
void Engine::moveFollowers(Channel& channel, TimePoint now) noexcept {
  if (memberFor(channel.follower(), now) == nullptr) return;
  waiting_.splice(waiting_.begin(), channel.takeFollowers());
}

void Engine::endIdle(TimePoint now) noexcept {
  for (auto member = members_.begin(); member != members_.end() && members_.size() > 1;) {
    const bool isIdle =
        member->channel().empty() && now - member->usedAt >= context_.settings.idleTime;
    member = isIdle ? members_.erase(member) : std::next(member);
  }
}

void Engine::stop(std::string_view why) noexcept {
  for (Member& member : members_) {
    member.connection.dismiss();
    member.channel().failAll(why);
    append(finished_, member.channel().finished());
  }
  members_.clear();
  failAll(waiting_, finished_, why);
}

}  // namespace ironmoat::client
