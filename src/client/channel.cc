#include "client/channel.h"

#include <utility>

#include "client/greeting.h"
#include "frames/frame.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {

constexpr auto kFirstBackOff = 10ms;  // doubled four times: five starts take 150 ms
constexpr unsigned kMaxDoublings = 4;

/// "the service sent a broken frame over this message: ...", the reason last.
Failure crashed(const Loss& loss) noexcept {
  const std::string text = textOrNone([&] {
    std::string made = "the service " + loss.what;
    const std::size_t reason =
        loss.why == Loss::Why::violation ? made.find(": ") : std::string::npos;
    return made.insert(std::min(reason, made.size()), " over this message");
  });
  return serviceError(ServiceError::Kind::crashed, text);
}

std::size_t frameSize(const Request& request) noexcept {
  return frames::requestHeadBytes(request.outputType()) + request.message().size();
}

}  // namespace

Channel::Channel(Clock::duration startTime, Counters& counters)
    : startTime_(startTime), counters_(counters) {
  staged_.reserve(kAtOnce * (frames::kMaxRequestHead + kWorthCopying));
}

void Channel::add(std::shared_ptr<Request> request, TimePoint now) noexcept {
  if (unsent_ == nullptr) unsent_ = request.get();
  requests_.push(std::move(request));
  if (++size_ == 1) startClock(now);
}

void Channel::cancel(Request& request, TimePoint now) noexcept {
  request.cancelled_ = true;
  Request* unsent = unsent_;
  if (unsent != nullptr && sentOfNext_ > 0) unsent = RequestList::after(*unsent);
  while (unsent != nullptr && unsent != &request) unsent = RequestList::after(*unsent);
  if (unsent == nullptr) return;  // sent: its place in the order of replies stays
  if (unsent_ == &request) unsent_ = RequestList::after(request);
  const bool wasFront = requests_.front() == &request;
  --size_;
  finish(requests_.remove(request));
  if (wasFront) startClock(now);
}

RequestList Channel::takeFollowers() noexcept {
  std::shared_ptr<Request> front = requests_.pop();
  RequestList followers(std::move(requests_));
  requests_.push(std::move(front));
  closed_ = true;
  wasShared_ = begun() > 1;
  size_ = inFlight_ = 1;
  unsent_ = nullptr;
  sentOfNext_ = 0;
  return followers;
}

/// Called when the front of a ready process is another one.
void Channel::startClock(TimePoint now) noexcept {
  if (state_ != State::ready || requests_.empty()) return;
  Request& front = *requests_.front();
  frontSince_ = now;
  if (front.due_ == TimePoint()) front.due_ = now + front.deadline_;
}

void Channel::started(TimePoint now) noexcept {
  state_ = State::greeting;
  greetBy_ = now + startTime_;
  counters_.add(&Stats::started);
}

void Channel::startFailed(std::string_view why, bool lasting, TimePoint now) noexcept {
  nextStart_ = now + kFirstBackOff * (1U << std::min(startFailures_, kMaxDoublings));
  ++startFailures_;
  if (lasting || startFailures_ >= kStartAttempts) failAll(why);
}

void Channel::receive(const Data& body, TimePoint now) {
  if (state_ == State::greeting) {
    const frames::Hello hello = frames::parseHello(body);
    requireUsable(hello);
    if (hasLimitedMemory(hello)) counters_.add(&Stats::limitedMemory);
    state_ = State::ready;
    return startClock(now);
  }
  const frames::Reply reply = frames::parseReply(body);
  if (inFlight_ == 0 || reply.id != requests_.front()->id_) {
    throw frames::FrameError("a reply to no request");
  }
  Request& front = *requests_.front();
  if (!front.cancelled_) counters_.count(front.resolve(reply));
  slowInARow_ = now - frontSince_ > front.deadline_ / 2 ? slowInARow_ + 1 : 0;
  ++answered_;
  startFailures_ = 0;
  --inFlight_;
  finish(popFront());
  startClock(now);
}

std::shared_ptr<Request> Channel::popFront() noexcept {
  std::shared_ptr<Request> request = requests_.pop();
  if (unsent_ == request.get()) {
    unsent_ = requests_.front();
    sentOfNext_ = 0;
  }
  --size_;
  return request;
}

void Channel::finish(std::shared_ptr<Request> request) noexcept {
  if (request->cancelled_) counters_.add(&Stats::cancelled);
  finished_.push(std::move(request));
}

void Channel::fail(std::shared_ptr<Request> request, Failure failure) noexcept {
  if (!request->cancelled_) {
    counters_.count(&failure);
    request->fail(std::move(failure));
  }
  finish(std::move(request));
}

void Channel::failAll(std::string_view why) noexcept {
  while (!requests_.empty()) {
    fail(popFront(), serviceError(ServiceError::Kind::unavailable, why));
  }
}

/// Takes the front out if it fails by rule 1 or 2.
bool Channel::blame(const Loss& loss) noexcept {
  if (begun() == 1 && !wasShared_ && loss.why == Loss::Why::deadline) {
    fail(popFront(), serviceError(ServiceError::Kind::timedOut, loss.what));
  } else if (begun() > 0 && given_ == 1 && requests_.front()->losses_ > 0) {
    fail(popFront(), crashed(loss));
  } else {
    return false;
  }
  return true;
}

void Channel::lost(const Loss& loss, TimePoint now) noexcept {
  counters_.add(&Stats::ended);
  if (std::exchange(state_, State::absent) == State::greeting) {
    return startFailed(loss.what, loss.why == Loss::Why::violation, now);
  }
  std::size_t suspects = begun();
  const bool blamed = blame(loss);
  if (blamed) --suspects;
  const bool restartClocks = suspects > 1 || loss.why == Loss::Why::deadline;
  RequestList retried;
  for (; suspects > 0; --suspects) {
    std::shared_ptr<Request> request = requests_.pop();
    if (request->cancelled_) {
      --size_;
      finish(std::move(request));
      continue;
    }
    if (request->losses_ < 2) ++request->losses_;
    if (restartClocks) request->due_ = {};
    counters_.add(&Stats::retried);
    retried.push(std::move(request));
  }
  retried.append(std::move(requests_));
  requests_.append(std::move(retried));
  const bool failedStart = answered_ == 0 && !blamed;
  resetProcess();
  if (!failedStart) return;
  startFailed(textOrNone([&] { return "the service " + loss.what + " before its first reply"; }),
              false, now);
}

void Channel::resetProcess() noexcept {
  unsent_ = requests_.front();
  sentOfNext_ = inFlight_ = 0;
  given_ = answered_ = slowInARow_ = 0;
  closed_ = wasShared_ = false;
}

void Channel::dismissed() noexcept {
  state_ = State::absent;
  counters_.add(&Stats::ended);
  resetProcess();
}

void Channel::replaced() noexcept {
  counters_.add(&Stats::started);
  counters_.add(&Stats::ended);
  counters_.add(&Stats::retired);
  resetProcess();
}

std::optional<Loss> Channel::expire(TimePoint now) noexcept {
  if (const Request* const front = requests_.front();
      front != nullptr && front->due_ != TimePoint() && now >= front->due_) {
    std::string what = textOrNone([&] {
      const auto limit = std::chrono::duration_cast<std::chrono::milliseconds>(front->deadline_);
      return "no reply within " + std::to_string(limit.count()) + " ms";
    });
    if (state_ == State::ready) return Loss{Loss::Why::deadline, std::move(what)};
    fail(popFront(), serviceError(ServiceError::Kind::timedOut, what));
  }
  if (state_ != State::greeting || now < greetBy_) return std::nullopt;
  return Loss{Loss::Why::violation,
              textOrNone([] { return std::string("sent no hello before the start deadline"); })};
}

TimePoint Channel::wakeAt() const noexcept {
  TimePoint at = TimePoint::max();
  if (state_ == State::greeting) at = greetBy_;
  if (requests_.empty()) return at;
  if (state_ == State::absent) at = nextStart_;
  const TimePoint due = requests_.front()->due_;
  return due == TimePoint() ? at : std::min(at, due);
}

std::size_t Channel::gather(std::span<iovec> parts) noexcept {
  if (!hasUnsent()) return 0;
  staged_.truncate(0);
  char* const staged = staged_.bytes();  // stays where it is: there is room for all
  std::size_t used = 0;
  std::size_t partStart = 0;  // of the staged part under way
  const auto endPart = [&] {
    if (staged_.size() == partStart) return;
    parts[used++] = {staged + partStart, staged_.size() - partStart};
    partStart = staged_.size();
  };
  std::size_t room = std::min(kAtOnce, window() - inFlight_);
  for (Request* request = unsent_; request != nullptr && room > 0 && parts.size() - used >= 2;
       request = RequestList::after(*request), --room) {
    if (request != unsent_ || sentOfNext_ == 0) request->id_ = ids_.next();
    const std::string_view message = request->message().view();
    frames::appendRequestHead(staged_, request->id_, request->outputType(), message.size());
    if (message.size() <= kWorthCopying) {
      staged_.append(message);
    } else {
      endPart();
      parts[used++] = {const_cast<char*>(message.data()), message.size()};
    }
  }
  endPart();
  std::size_t skip = sentOfNext_;
  for (std::size_t i = 0; skip > 0; ++i) {
    const std::size_t skipped = std::min(skip, parts[i].iov_len);
    parts[i].iov_base = static_cast<char*>(parts[i].iov_base) + skipped;
    parts[i].iov_len -= skipped;
    skip -= skipped;
  }
  return used;
}

void Channel::sent(std::size_t bytes) noexcept {
  while (bytes > 0) {
    if (sentOfNext_ == 0) ++given_;
    const std::size_t left = frameSize(*unsent_) - sentOfNext_;
    if (bytes < left) {
      sentOfNext_ += bytes;
      return;
    }
    bytes -= left;
    sentOfNext_ = 0;
    unsent_ = RequestList::after(*unsent_);
    ++inFlight_;
  }
}

}  // namespace ironmoat::client
