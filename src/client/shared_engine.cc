#include "client/shared_engine.h"

#include <pthread.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>

#include <algorithm>
#include <cerrno>
#include <string_view>
#include <system_error>
#include <utility>

#include "client/quiet_thread.h"

namespace ironmoat::client {

namespace {

constexpr std::size_t kOverhead = 512;  // about what comes with a message until its outcome

constexpr std::string_view kDestroyed = "the client was destroyed";

std::size_t cost(const Request& request) noexcept { return request.message().size() + kOverhead; }

}  // namespace

void SharedEngine::submit(std::shared_ptr<SubmittedRequest> request) {
  Lock lock(mutex_);
  if (stopping_) {
    lock.unlock();
    Failure failure = serviceError(ServiceError::Kind::unavailable, kDestroyed);
    counters_.count(&failure);
    request->fail(std::move(failure));
    return complete(*request);
  }
  if (!thread_.joinable()) startThread();
  const std::size_t bytes = cost(*request);
  // A completion that submits runs on the thread that makes room: it does not wait.
  if (std::this_thread::get_id() != thread_.get_id()) {
    const std::uint64_t ticket = nextTicket_++;
    while (ticket != admitted_ || !hasRoom(bytes)) driveOrWait(lock, nullptr, TimePoint::max());
    ++admitted_;
    for (Waiter* next = firstWaiter_; next != nullptr; next = next->next) {
      if (next->request == nullptr) next->changed.notify_one();  // there may be room for more
    }
  }
  bytesInFlight_ += bytes;
  if (request->hasCompletion_) ++completions_;
  const bool first = inFlight_++ == 0;
  submitted_.push(std::move(request));
  if (++submittedCount_ >= worthSending_) {
    if (!driven_) {
      drive(TimePoint());
    } else if (std::exchange(asleep_, false)) {
      ::eventfd_write(wake_.get(), 1);
    }
  }
  if (first || completions_ > 0) threadWakes_.notify_one();
  if (!driven_) passOn();  // to one that came to wait while this thread drove
}

bool SharedEngine::hasRoom(std::size_t bytes) const {
  return bytesInFlight_ == 0 || (bytesInFlight_ <= settings_.maxBytesInFlight &&
                                 bytes <= settings_.maxBytesInFlight - bytesInFlight_);
}

void SharedEngine::startThread() {
  engine_ = std::make_unique<Engine>(settings_, counters_);
  wake_ = FileDescriptor(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  epoll_event event = {};
  event.events = EPOLLIN;
  if (!wake_ || ::epoll_ctl(engine_->fd(), EPOLL_CTL_ADD, wake_.get(), &event) != 0) {
    throw std::system_error(errno, std::generic_category(), "eventfd");
  }
  thread_ = startQuietThread(&SharedEngine::run, this);
}

void SharedEngine::drive(TimePoint until) noexcept {
  driven_ = true;
  for (bool waited = false;;) {
    RequestList submitted(std::move(submitted_));
    submittedCount_ = 0;
    mutex_.unlock();
    while (std::shared_ptr<Request> request = submitted.pop()) engine_->add(std::move(request));
    engine_->step();
    RequestList finished(std::move(engine_->finished()));
    mutex_.lock();
    const bool progress = !finished.empty();
    publish(std::move(finished));
    worthSending_ = engine_->worthAdding();
    if (progress || waited || stopping_ || until <= Clock::now()) break;
    if (submittedCount_ >= worthSending_) continue;
    asleep_ = true;
    const TimePoint at = std::min(until, engine_->wakeAt());
    mutex_.unlock();
    engine_->wait(millisecondsUntil(at));
    mutex_.lock();
    if (eventfd_t ignored = 0; !std::exchange(asleep_, false)) {
      ::eventfd_read(wake_.get(), &ignored);
    }
    waited = true;
  }
  driven_ = false;
  ++drives_;
}

void SharedEngine::driveOrWait(Lock& lock, const SubmittedRequest* request, TimePoint until) {
  if (!driven_ && !stopping_) return drive(until);
  Waiter self{request, {}, nullptr};
  Waiter** place = &firstWaiter_;
  while (*place != nullptr) place = &(*place)->next;
  *place = &self;
  if (until == TimePoint::max()) {
    lock.wait(self.changed);
  } else {
    lock.waitUntil(self.changed, until);
  }
  place = &firstWaiter_;
  while (*place != &self) place = &(*place)->next;
  *place = self.next;
}

bool SharedEngine::await(const SubmittedRequest& request, TimePoint until) {
  if (request.isDone()) return true;
  Lock lock(mutex_);
  do {
    driveOrWait(lock, &request, until);
  } while (!request.isDone() && Clock::now() < until);
  if (!driven_) passOn();
  return request.isDone();
}

void SharedEngine::passOn() noexcept {
  if (firstWaiter_ != nullptr) firstWaiter_->changed.notify_one();
}

void SharedEngine::publish(RequestList finished) noexcept {
  if (finished.empty()) return;
  while (std::shared_ptr<Request> request = finished.pop()) {
    auto& each = static_cast<SubmittedRequest&>(*request);
    bytesInFlight_ -= cost(each);
    --inFlight_;
    each.done_.store(true, std::memory_order_release);
    if (!each.hasCompletion_) continue;
    --completions_;
    completed_.push(std::move(request));
  }
  for (Waiter* waiter = firstWaiter_; waiter != nullptr; waiter = waiter->next) {
    if (waiter->request == nullptr || waiter->request->isDone()) waiter->changed.notify_one();
  }
  if (!completed_.empty()) threadWakes_.notify_one();
}

void SharedEngine::run() noexcept {
  ::pthread_setname_np(::pthread_self(), "ironmoat-client");
  Lock lock(mutex_);
  std::uint64_t seen = 0;
  while (!stopping_) {
    if (!completed_.empty()) {
      RequestList completed(std::move(completed_));
      lock.unlock();
      completed.deliverAll();
      lock.lock();
    } else if (!driven_ && inFlight_ > 0 && (completions_ > 0 || drives_ == seen)) {
      drive(Clock::now() + kTick);
      seen = drives_;
      passOn();
    } else if (inFlight_ > 0) {
      seen = drives_;
      lock.waitUntil(threadWakes_, Clock::now() + kTick);
    } else {
      lock.wait(threadWakes_);
    }
  }
}

void SharedEngine::addTo(Stats& stats) noexcept {
  const Lock lock(mutex_);
  stats.inFlight += inFlight_;
  stats.bytesInFlight += bytesInFlight_ - inFlight_ * kOverhead;
}

void SharedEngine::complete(SubmittedRequest& request) noexcept {
  request.done_.store(true, std::memory_order_release);
  request.deliver();
}

void SharedEngine::stop() noexcept {
  Lock lock(mutex_);
  if (!thread_.joinable()) return;
  stopping_ = true;
  ::eventfd_write(wake_.get(), 1);
  threadWakes_.notify_one();
  lock.unlock();
  thread_.join();
  lock.lock();
  while (driven_) lock.waitUntil(threadWakes_, Clock::now() + std::chrono::milliseconds(1));
  RequestList unsent(std::move(submitted_));
  while (std::shared_ptr<Request> request = unsent.pop()) engine_->add(std::move(request));
  engine_->stop(kDestroyed);
  publish(std::move(engine_->finished()));
  RequestList completed(std::move(completed_));
  lock.unlock();
  completed.deliverAll();
}

}  // namespace ironmoat::client
