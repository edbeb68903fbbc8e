#include "client/shared_engine.h"

#include <pthread.h>

#include <algorithm>
#include <csignal>
#include <string>
#include <system_error>
#include <utility>

namespace ironmoat::client {

namespace {

constexpr std::string_view kDestroyed = "the client was destroyed";
constexpr std::size_t kOverhead = 512;  // about what a request takes besides its message

std::size_t cost(const Request& request) noexcept { return request.message().size() + kOverhead; }

/// Blocks all signals but those that a thread causes itself, for a thread to be started.
class SignalsBlocked {
 public:
  SignalsBlocked() noexcept {
    sigset_t foreign;
    ::sigfillset(&foreign);
    for (const int own : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS, SIGABRT}) {
      ::sigdelset(&foreign, own);
    }
    ::pthread_sigmask(SIG_BLOCK, &foreign, &before_);
  }
  SignalsBlocked(const SignalsBlocked&) = delete;
  SignalsBlocked& operator=(const SignalsBlocked&) = delete;
  ~SignalsBlocked() { ::pthread_sigmask(SIG_SETMASK, &before_, nullptr); }

 private:
  sigset_t before_{};
};

}  // namespace

void SharedEngine::startThread() try {
  if (!engine_) engine_ = std::make_unique<Engine>(context_);
  const SignalsBlocked blocked;  // a thread starts with its maker's mask
  thread_ = std::thread(&SharedEngine::run, this);
} catch (const std::system_error& error) {
  throw ServiceError(ServiceError::Kind::unavailable,
                     std::string("cannot start the client's thread: ") + error.what());
}

void SharedEngine::submit(std::shared_ptr<Request> request) {
  const std::size_t bytes = cost(*request);
  const bool hasCompletion = request->hasCompletion();
  RequestList one{std::move(request)};
  Lock lock(mutex_);
  if (stopping_) throw ServiceError(ServiceError::Kind::unavailable, std::string(kDestroyed));
  if (!thread_.joinable()) startThread();
  if (one.front()->isDone()) {
    append(completed_, one);
    threadWakes_.notify_one();
    return;
  }
  // A completion that submits runs on the thread that makes room: it must not wait.
  if (std::this_thread::get_id() != thread_.get_id()) {
    const std::uint64_t ticket = nextTicket_++;
    while (ticket != admitted_ || !hasRoom(bytes)) driveOrWait(lock, TimePoint::max());
    if (++admitted_ != nextTicket_) changed_.notify_all();  // the next one may have room, too
  }
  bytesInFlight_ += bytes;
  completions_ += hasCompletion ? 1 : 0;
  if (inFlight_++ == 0 || hasCompletion) threadWakes_.notify_one();
  engine_->add(std::move(one));
  if (engine_->isWorthSending()) step(Engine::Seen::nothing);
}

bool SharedEngine::hasRoom(std::size_t bytes) const noexcept {
  const std::size_t limit = context_.settings.maxBytesInFlight;
  return bytesInFlight_ == 0 || (bytesInFlight_ <= limit && bytes <= limit - bytesInFlight_);
}

bool SharedEngine::await(const Request& request, TimePoint until) noexcept {
  if (request.isDone()) return true;
  Lock lock(mutex_);
  do {
    driveOrWait(lock, until);
  } while (!request.isDone() && Clock::now() < until);
  return request.isDone();
}

void SharedEngine::driveOrWait(Lock& lock, TimePoint until) noexcept {
  if (!driven_ && !stopping_) {
    drive(until);
    return;
  }
  ++waiters_;
  lock.waitUntil(changed_, until);
  --waiters_;
}

void SharedEngine::drive(TimePoint until) noexcept {
  driven_ = true;
  if (!step(Engine::Seen::nothing) && Clock::now() < until) {
    const int time = millisecondsUntil(std::min({until, engine_->wakeAt(), Clock::now() + kTick}));
    const Engine& engine = *engine_;
    Engine::Seen seen = Engine::Seen::nothing;
    const auto look = [&](int milliseconds) {
      seen = engine.wait(milliseconds);
      return seen != Engine::Seen::nothing;
    };
    mutex_.unlock();
    static_cast<void>(spin_([&] { return look(0); }) || look(time));
    mutex_.lock();
    step(seen);
  }
  driven_ = false;
  changed_.notify_all();
}

bool SharedEngine::step(Engine::Seen seen) noexcept {
  engine_->step(seen);
  ++steps_;
  return publish();
}

bool SharedEngine::publish() noexcept {
  RequestList& finished = engine_->finished();
  if (finished.empty()) return false;
  while (!finished.empty()) {
    RequestList one = takeFirst(finished);
    bytesInFlight_ -= cost(*one.front());
    --inFlight_;
    if (!one.front()->hasCompletion()) continue;
    --completions_;
    append(completed_, one);
  }
  changed_.notify_all();
  if (!completed_.empty()) threadWakes_.notify_one();
  return true;
}

void SharedEngine::run() noexcept {
  ::pthread_setname_np(::pthread_self(), "ironmoat-client");
  Lock lock(mutex_);
  std::uint64_t seen = 0;
  while (!stopping_) {
    if (!completed_.empty()) {
      RequestList completed = std::move(completed_);
      lock.unlock();
      deliverAll(std::move(completed));
      lock.lock();
    } else if (inFlight_ == 0) {
      lock.waitUntil(threadWakes_, TimePoint::max());
    } else if (!driven_ && (completions_ > 0 || (waiters_ == 0 && steps_ == seen))) {
      drive(Clock::now() + kTick);
      seen = steps_;
    } else {
      seen = steps_;
      lock.waitUntil(threadWakes_, Clock::now() + kTick);
    }
  }
}

void SharedEngine::stop() noexcept {
  Lock lock(mutex_);
  if (!thread_.joinable()) return;
  stopping_ = true;
  threadWakes_.notify_one();
  std::thread thread = std::move(thread_);
  lock.unlock();
  thread.join();
  lock.lock();
  while (driven_) lock.waitUntil(changed_, TimePoint::max());
  engine_->stop(kDestroyed);
  publish();
  engine_.reset();  // a Pending that outlives the client keeps no descriptor
  RequestList completed = std::move(completed_);
  lock.unlock();
  deliverAll(std::move(completed));
}

}  // namespace ironmoat::client
