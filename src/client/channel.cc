#include "client/channel.h"

#include <sys/random.h>

#include <algorithm>
#include <iterator>
#include <utility>

#include "frames/frame.h"
#include "sandbox_parts/sandbox_parts.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {

// After each failed start in a row. The first pause is short: a process may be lost by chance.
constexpr std::array kBackOff = {1ms, 5ms, 25ms, 125ms};

// Messages up to kMaxCopied bytes are copied into one piece with their neighbours, as long as that
// has less than kBatch.
constexpr std::size_t kBatch = std::size_t{64} << 10;
constexpr std::size_t kMaxCopied = std::size_t{16} << 10;

bool has(const frames::Hello& hello, sandbox::Part part) noexcept {
  return (hello.sandbox & static_cast<std::uint32_t>(part)) != 0;
}

}  // namespace

frames::Hello usableHello(const Data& body) {
  const frames::Hello hello = frames::parseHello(body);
  frames::Hello expected = frames::Hello::ours();
  expected.sandbox = hello.sandbox;
  if (hello != expected) throw frames::FrameError("its limits differ from this library's");
  for (const auto& [part, name, need] : sandbox::kParts) {
    if (isRequired(part) && !has(hello, part)) {
      throw frames::FrameError("its sandbox lacks: " + std::string(name));
    }
  }
  return hello;
}

namespace {

/// "the service sent a broken frame over this message: ...", the reason last.
Failure crashed(const Loss& loss) noexcept {
  return serviceError(ServiceError::Kind::crashed, [&] {
    std::string text = "the service " + loss.what;
    const bool hasReason = loss.why == Loss::Why::violation;
    const std::size_t reason = hasReason ? text.find(": ") : std::string::npos;
    return text.insert(std::min(reason, text.size()), " over this message");
  });
}

}  // namespace

std::uint64_t RequestIds::next() noexcept {
  if (left_ == 0) {
    // 256 bytes come whole. A kernel that has none to give leaves ids that are merely different.
    if (::getrandom(pool_.data(), sizeof pool_, 0) != static_cast<ssize_t>(sizeof pool_)) {
      for (std::uint64_t& id : pool_) ++id;
    }
    left_ = pool_.size();
  }
  const std::uint64_t id = pool_[--left_];
  return id == 0 ? next() : id;
}

Channel::Channel(Clock::duration startTime, Counters& counters)
    : startTime_(startTime), counters_(counters) {
  encoded_.reserve(kBatch + frames::kMaxRequestHead + kMaxCopied);  // encoding never allocates
}

void Channel::add(RequestList requests, TimePoint now) noexcept {
  const bool first = requests_.empty();
  const auto added = requests.begin();
  append(requests_, requests);
  if (unsent_ == requests_.end()) unsent_ = added;
  if (first) startClock(now);
}

RequestList Channel::takeFollowers() noexcept {
  RequestList followers;
  followers.splice(followers.end(), requests_, std::next(requests_.begin()), requests_.end());
  closed_ = true;
  wasShared_ = inFlight_ > 1;
  if (wasShared_) tail_ = {};  // of a follower
  inFlight_ = 1;
  wholeInFlight_ = std::min(wholeInFlight_, inFlight_);
  unsent_ = requests_.end();
  return followers;
}

/// To be called whenever another request is the front of a ready process.
void Channel::startClock(TimePoint now) noexcept {
  if (state_ != State::ready || requests_.empty()) return;
  Request& front = *requests_.front();
  frontSince_ = now;
  if (front.due_ == TimePoint()) front.due_ = now + front.deadline();
}

void Channel::started(TimePoint now) noexcept {
  state_ = State::greeting;
  greetBy_ = now + startTime_;
  counters_.add(&Stats::started);
}

void Channel::startFailed(std::string_view why, bool lasting, TimePoint now) noexcept {
  nextStart_ = now + kBackOff[std::min<std::size_t>(startFailures_, kBackOff.size() - 1)];
  ++startFailures_;
  if (lasting || startFailures_ >= kStartAttempts) failAll(why);
}

void Channel::receive(const Data& body, TimePoint now) {
  if (state_ == State::greeting) {
    const frames::Hello hello = usableHello(body);
    if (!has(hello, sandbox::Part::fullMemory)) counters_.add(&Stats::limitedMemory);
    state_ = State::ready;
    return startClock(now);
  }
  const frames::Reply reply = frames::parseReply(body);
  // A long message is sent from where it is: it must not be released before it is sent.
  const bool isSent = inFlight_ > 1 || (inFlight_ == 1 && tail_.empty());
  if (!isSent || reply.id != front().id_) throw frames::FrameError("a reply to no request");
  requests_.front()->resolve(reply);
  slowInARow_ = now - frontSince_ > front().deadline() / 2 ? slowInARow_ + 1 : 0;
  ++answered_;
  startFailures_ = 0;
  --inFlight_;
  if (wholeInFlight_ > 0) --wholeInFlight_;
  finished_.splice(finished_.end(), requests_, requests_.begin());
  startClock(now);
}

void Channel::failAll(std::string_view why) noexcept {
  client::failAll(requests_, finished_, why);
  forgetProcess();
}

/// Takes the front out if it fails by rule 1 or 2.
bool Channel::blame(RequestList& suspects, const Loss& loss) noexcept {
  if (suspects.empty()) return false;
  Request& front = *suspects.front();
  if (suspects.size() == 1 && !wasShared_ && loss.why == Loss::Why::deadline) {
    front.fail(serviceError(ServiceError::Kind::timedOut, [&] { return loss.what; }));
  } else if (given_ == 1 && front.isRetried()) {
    front.fail(crashed(loss));
  } else {
    return false;
  }
  if (front.isRetried() && startFailures_ > 0) --startFailures_;  // its first loss was none
  finished_.splice(finished_.end(), suspects, suspects.begin());
  return true;
}

void Channel::lost(const Loss& loss, TimePoint now) noexcept {
  counters_.add(&Stats::ended);
  if (std::exchange(state_, State::absent) == State::greeting) {
    return startFailed(loss.what, loss.why == Loss::Why::violation, now);
  }
  RequestList suspects;
  suspects.splice(suspects.end(), requests_, requests_.begin(),
                  std::next(requests_.begin(), static_cast<std::ptrdiff_t>(inFlight_)));
  const bool blamed = blame(suspects, loss);
  const bool restartClocks = suspects.size() > 1 || loss.why == Loss::Why::deadline;
  RequestList retried;
  while (!suspects.empty()) {
    Request& request = *suspects.front();
    if (request.isCancelled()) request.drop();
    RequestList& to = request.isDone() ? finished_ : retried;
    to.splice(to.end(), suspects, suspects.begin());
    if (request.isDone()) continue;
    request.retried_ = true;
    if (restartClocks) request.due_ = {};
    counters_.add(&Stats::retried);
  }
  requests_.splice(requests_.begin(), retried);
  const bool failedStart = answered_ == 0 && !blamed;
  forgetProcess();
  if (!failedStart) return;
  startFailed(textOrNone([&] { return "the service " + loss.what + " before its first reply"; }),
              false, now);
}

void Channel::dismissed() noexcept {
  state_ = State::absent;
  counters_.add(&Stats::ended);
  forgetProcess();
}

void Channel::forgetProcess() noexcept {
  unsent_ = requests_.begin();
  encoded_.truncate(0);
  tail_ = {};
  encodedSent_ = inFlight_ = wholeInFlight_ = 0;
  given_ = answered_ = slowInARow_ = 0;
  closed_ = wasShared_ = false;
}

std::optional<Loss> Channel::expire(TimePoint now) noexcept {
  if (!empty() && front().due_ != TimePoint() && now >= front().due_) {
    std::string what = textOrNone([&] {
      const auto limit = std::chrono::duration_cast<std::chrono::milliseconds>(front().deadline());
      return "no reply within " + std::to_string(limit.count()) + " ms";
    });
    if (state_ == State::ready) return Loss{Loss::Why::deadline, std::move(what)};
    requests_.front()->fail(serviceError(ServiceError::Kind::timedOut, [&] { return what; }));
    finished_.splice(finished_.end(), requests_, requests_.begin());
    unsent_ = requests_.begin();
  }
  if (state_ != State::greeting || now < greetBy_) return std::nullopt;
  return Loss{Loss::Why::violation,
              textOrNone([] { return std::string("sent no hello before the start deadline"); })};
}

TimePoint Channel::wakeAt() const noexcept {
  TimePoint at = TimePoint::max();
  if (state_ == State::greeting) at = greetBy_;
  if (empty()) return at;
  if (state_ == State::absent) at = nextStart_;
  return front().due_ == TimePoint() ? at : std::min(at, front().due_);
}

void Channel::encodeNext() noexcept {
  Request& request = **unsent_++;
  const std::string_view message = request.message().view();
  request.id_ = ids_.next();
  frames::appendRequestHead(encoded_, request.id_, request.outputType(), message.size());
  if (message.size() <= kMaxCopied) {
    encoded_.append(message);
  } else {
    tail_ = message;
  }
  ++inFlight_;
  ++given_;
}

std::array<iovec, 2> Channel::output() noexcept {
  if (!hasEncoded()) {
    encoded_.truncate(0);
    encodedSent_ = 0;
    wholeInFlight_ = inFlight_;
    while (canEncode() && tail_.empty() && encoded_.size() < kBatch) encodeNext();
  }
  return {{{encoded_.bytes() + encodedSent_, encoded_.size() - encodedSent_},
           {const_cast<char*>(tail_.data()), tail_.size()}}};
}

void Channel::sent(std::size_t bytes) noexcept {
  const std::size_t encoded = std::min(bytes, encoded_.size() - encodedSent_);
  encodedSent_ += encoded;
  tail_.remove_prefix(bytes - encoded);
}

}  // namespace ironmoat::client
