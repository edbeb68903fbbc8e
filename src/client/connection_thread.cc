// The part of Connection that its own thread does: starting, watching and replacing the process.

#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>

#include <algorithm>
#include <array>
#include <exception>
#include <string>
#include <string_view>
#include <utility>

#include "client/connection.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {

constexpr auto kLeastGreetingTime = 2s;
constexpr auto kFirstBackOff = 10ms;
constexpr auto kLongestBackOff = 1s;
constexpr unsigned kStartAttempts = 5;  // in 150 ms
constexpr auto kGraceToEnd = 100ms;     // from a closed socket to a process that has ended
constexpr auto kGraceToReadUp = 100ms;  // past a deadline, while replies wait to be read
constexpr auto kReadOn = 100ms;         // after the last submit
constexpr auto kTick = 1ms;             // that callers are given to read by themselves

std::exception_ptr serviceError(ServiceError::Kind kind, std::string_view message) noexcept {
  try {
    return std::make_exception_ptr(ServiceError(kind, std::string(message)));
  } catch (...) {  // no memory for the message
    return std::current_exception();
  }
}

}  // namespace

void Connection::run() noexcept {
  ::pthread_setname_np(::pthread_self(), "ironmoat-client");
  Lock lock(mutex_);
  while (!stopping_) {
    try {
      turn(lock);
    } catch (const std::exception& error) {  // memory ran out
      if (!lock.owns_lock()) lock.lock();
      if (reader_ != Reader::caller) failAll(lock, error.what());
    }
  }
  readerLeft_.wait(lock, [&] { return reader_ != Reader::caller; });
  failAll(lock, "the client was destroyed");
}

void Connection::turn(Lock& lock) {
  chooseReader(Clock::now());
  if (trouble_ && reader_ == Reader::thread) {
    return lose(lock, *std::exchange(trouble_, std::nullopt), ServiceError::Kind::crashed);
  }
  if (state_ == State::absent && !queue_.empty() && Clock::now() >= nextStart_) start(lock);
  if (state_ == State::ready) flush();

  std::array<pollfd, 3> fds = {{{wake_.get(), POLLIN, 0}, {-1, 0, 0}, {-1, POLLIN, 0}}};
  auto& [woken, socket, ended] = fds;
  const bool reads = reader_ == Reader::thread && state_ != State::absent;
  if (reads) socket.events = POLLIN;
  if (queue_.hasUnsent() && !unwritable_) socket.events |= POLLOUT;
  if (socket.events != 0) socket.fd = reads ? process_->socket() : socket_;
  watchesEnd_ = reader_ != Reader::caller && state_ != State::absent;
  if (watchesEnd_) ended.fd = process_->endedFd();
  const int most = timeout(Clock::now());
  waiting_ = true;
  lock.unlock();
  const int count = ::poll(fds.data(), fds.size(), most);
  lock.lock();
  waiting_ = false;
  if (count < 0) return;  // interrupted
  if (woken.revents != 0) {
    eventfd_t ignored = 0;
    ::eventfd_read(wake_.get(), &ignored);
  }
  if (stopping_) return;
  if (!reads) {
    ended_ = ended.revents != 0 && reader_ == Reader::nobody;
    return;
  }
  const bool readable = (socket.revents & POLLIN) != 0;
  const bool over = (socket.revents & (POLLHUP | POLLERR)) != 0 || ended.revents != 0;
  if (readable || over || unwritable_) {
    lock.unlock();
    const Came came = readSome();  // also when it has ended, as in `readUntilDone`
    lock.lock();
    if (came != Came::nothing || !readable) trouble_ = take(lock, came);
  }
  if (trouble_) return;
  const auto now = Clock::now();
  if (state_ == State::greeting && now >= greetBy_) {
    lose(lock, "did not greet in time", ServiceError::Kind::crashed);
  } else if (const auto expiry = queue_.expiry(); expiry && now >= *expiry) {
    // Its reply may have come and wait behind others.
    if (readable && now - *expiry < kGraceToReadUp) return;
    const auto deadline = std::chrono::duration_cast<std::chrono::milliseconds>(deadline_);
    lose(lock, "no reply within " + std::to_string(deadline.count()) + " ms",
         ServiceError::Kind::timedOut);
  }
}

/// The thread reads what is out of order, and what no caller has read for a tick. It leaves that to
/// the first who waits; until then it reads on, for a while also with nothing in flight: another
/// submit is likely, and need not wake it then.
void Connection::chooseReader(TimePoint now) noexcept {
  if (reader_ == Reader::caller) return;
  if (state_ != State::ready || trouble_ || unwritable_ || ended_ || isOverdue(now)) {
    const bool idle = state_ == State::absent && queue_.empty() && !trouble_;
    reader_ = idle ? Reader::nobody : Reader::thread;
    return;
  }
  if (std::exchange(callersTurn_, false)) unreadSince_ = now;
  const bool reads = std::exchange(reader_, Reader::nobody) == Reader::thread;
  if (!sleepers_.empty()) return findReader();
  const bool goesOn = reads && now - lastSubmit_ < std::min<Clock::duration>(deadline_, kReadOn);
  const bool isLeft = !queue_.empty() && (reads || now - unreadSince_ >= kTick);
  if (goesOn || isLeft) reader_ = Reader::thread;
}

int Connection::timeout(TimePoint now) noexcept {
  const bool unread = state_ == State::ready && reader_ == Reader::nobody && !queue_.empty();
  attentive_ = std::exchange(stirred_, false) || unread;
  if (reader_ == Reader::thread && state_ != State::absent && unwritable_) return 0;
  const int wait = reader_ == Reader::thread ? waitMilliseconds(now) : -1;
  constexpr int tick = kTick / 1ms;
  return attentive_ && (wait < 0 || wait > tick) ? tick : wait;
}

/// With nothing in flight it wakes before anything submitted meanwhile can be late.
int Connection::waitMilliseconds(TimePoint now) const noexcept {
  TimePoint until = now + std::min<Clock::duration>(deadline_, kReadOn);
  if (state_ == State::greeting) {
    until = greetBy_;
  } else if (state_ == State::absent && !queue_.empty()) {
    until = nextStart_;
  } else if (const auto expiry = queue_.expiry()) {
    until = *expiry;
  }
  const auto wait = std::chrono::ceil<std::chrono::milliseconds>(until - now);
  return static_cast<int>(std::clamp<std::chrono::milliseconds>(wait, 0ms, 1h).count());
}

void Connection::start(Lock& lock) {
  lock.unlock();
  std::optional<StartError> failure;
  try {
    process_.emplace(ServiceProcess::start(program_));
    assembler_.emplace(frames::kMaxReplyBody, Sharing::anyThread);
  } catch (const StartError& error) {
    failure = error;
  }
  lock.lock();
  if (failure) return startFailed(lock, failure->what(), failure->passing());
  greetBy_ = Clock::now() + std::max<Clock::duration>(deadline_, kLeastGreetingTime);
  state_ = State::greeting;
}

void Connection::startFailed(Lock& lock, const std::string& why, bool passing) {
  ++startFailures_;
  const auto backOff = kFirstBackOff * (1U << std::min(startFailures_ - 1, 10U));
  nextStart_ = Clock::now() + std::min<Clock::duration>(backOff, kLongestBackOff);
  if (!passing || startFailures_ >= kStartAttempts) failAll(lock, why);
}

void Connection::lose(Lock& lock, const std::string& what, ServiceError::Kind kind) {
  const bool greeted = std::exchange(state_, State::absent) == State::ready;
  unwritable_ = ended_ = false;
  socket_ = -1;
  lock.unlock();
  // The process is gone before anyone hears of it.
  const bool byItself = what.empty();
  const std::string word = byItself ? process_->lastWord(kGraceToEnd) : what;
  process_.reset();
  assembler_.reset();
  lock.lock();
  if (!greeted) {
    return startFailed(lock,
                       program_ + " " + word + (byItself ? " before it greeted" : "") +
                           (word.find("SIGSYS") != std::string::npos
                                ? "; does a filter over this process forbid seccomp?"
                                : ""),
                       byItself);
  }
  const bool late = kind == ServiceError::Kind::timedOut;
  // Made before the culprit is taken out, who would have no outcome if memory ran out here.
  const std::size_t reason = byItself ? std::string::npos : word.find(": ");
  std::string sentence = word;
  if (!late) {
    sentence.insert(std::min(reason, word.size()), " over this message").insert(0, "the service ");
  }
  const std::shared_ptr<Request> culprit = queue_.lose();
  if (culprit != nullptr) giveUp(*culprit, serviceError(kind, sentence));
}

void Connection::giveUp(Request& request, std::exception_ptr error) noexcept {
  admission_.leave(request.cost());
  request.fail(std::move(error));
  if (request.sleeper != nullptr) request.sleeper->notify_one();
}

void Connection::failAll(Lock& lock, std::string_view why) noexcept {
  state_ = State::absent;
  unwritable_ = ended_ = false;
  socket_ = -1;
  trouble_.reset();
  lock.unlock();
  process_.reset();
  assembler_.reset();
  lock.lock();
  auto request = queue_.lose();
  for (; request != nullptr || !queue_.empty(); request.reset()) {
    if (request == nullptr) request = queue_.takeFront();
    giveUp(*request, serviceError(ServiceError::Kind::unavailable, why));
  }
}

}  // namespace ironmoat::client
