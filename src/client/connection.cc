#include "client/connection.h"

#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <new>
#include <string_view>
#include <system_error>
#include <utility>

#include "client/greeting.h"
#include "client/quiet_thread.h"
#include "frames/record_codec.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {

constexpr int kWritesInARow = 4;     // before replies are looked at again
constexpr std::size_t kAtOnce = 64;  // replies given out together, at most
constexpr std::size_t kMostParts = 2 * RequestQueue::kMostAtOnce;  // of a write

std::exception_ptr unavailable(const std::string& why) {
  return std::make_exception_ptr(ServiceError(ServiceError::Kind::unavailable, why));
}

/// What the service did. Empty, as of one that has ended, when there is no memory to say it.
std::string violation(std::string_view what, const char* how = "") noexcept {
  try {
    return std::string(what).append(how);
  } catch (const std::bad_alloc&) {
    return {};
  }
}

/// The calling thread is not cancelled while it has a place or a turn that others wait for.
class Uncancelled {
 public:
  Uncancelled() noexcept { ::pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &before_); }
  Uncancelled(const Uncancelled&) = delete;
  Uncancelled& operator=(const Uncancelled&) = delete;
  ~Uncancelled() { ::pthread_setcancelstate(before_, nullptr); }

 private:
  int before_ = 0;
};

}  // namespace

Connection::Connection(Client::Options options)
    : program_(std::move(options.program)),
      deadline_(std::clamp<std::chrono::milliseconds>(options.deadline, 1ms, 24h)),
      admission_(options.maxBytesInFlight),
      queue_(deadline_) {
  answers_.reserve(kAtOnce);
}

void Connection::stop() noexcept {
  const Uncancelled whole;
  {
    const Lock lock(mutex_);
    stopping_ = true;
    admission_.stop();
    if (reader_ == Reader::caller && socket_ >= 0) ::shutdown(socket_, SHUT_RDWR);
    if (wake_) wake();
  }
  if (thread_.joinable()) thread_.join();
}

void Connection::submit(std::shared_ptr<Request> request, Then then) {
  if (inForkedChild()) {
    return request->fail(unavailable("this client belongs to the process that forked this one"));
  }
  const Uncancelled whole;
  Lock lock(mutex_);
  try {
    if (!thread_.joinable()) startThread();
  } catch (const std::system_error& error) {
    return request->fail(
        unavailable(std::string("cannot start the client's thread: ") + error.what()));
  }
  const std::size_t cost = request->cost();
  if (!admission_.enter(lock, cost)) {
    return request->fail(unavailable("the client is being destroyed"));
  }
  const bool first = queue_.empty();
  const bool wasBlocked = blocked_;
  const TimePoint now = Clock::now();
  try {
    queue_.push(std::move(request), now);
  } catch (...) {
    admission_.leave(cost);
    throw;
  }
  if (then == Then::returns) {
    lastSubmit_ = now;
    stirred_ = true;
    if (first) callersTurn_ = true;
  }
  // Others may follow it: held back for a moment, many are sent with one system call, by whoever
  // submits the last of them or is about to wait for one.
  const bool held = then == Then::returns && attentive_ && !queue_.isWorthSending();
  if (state_ == State::ready && !blocked_ && !held) flush();
  const bool news = state_ == State::ready ? blocked_ && !wasBlocked : first;
  const bool unread = then == Then::returns && reader_ == Reader::nobody && !attentive_;
  if (waiting_ && (news || unread)) wake();
}

bool Connection::await(Request& request, TimePoint until) {
  if (inForkedChild()) {
    request.fail(unavailable("this client belongs to the process that forked this one"));
    return true;
  }
  const Uncancelled whole;
  Lock lock(mutex_);
  while (!request.isDone()) {
    const TimePoint now = Clock::now();
    if (callerMayRead(now)) {
      readUntilDone(lock, request, until);
    } else if (now < until) {
      if (reader_ == Reader::nobody && waiting_) wake();  // it has become overdue on the way here
      sleep(lock, request, until);
    }
    if (!request.isDone() && Clock::now() >= until) {
      if (reader_ == Reader::nobody) findReader();  // who was waiting may have been called to read
      return false;
    }
  }
  return true;
}

bool Connection::isOverdue(TimePoint now) const noexcept {
  const auto expiry = queue_.expiry();
  return expiry && now >= *expiry;
}

/// What is out of order is the thread's.
bool Connection::callerMayRead(TimePoint now) const noexcept {
  return reader_ == Reader::nobody && state_ == State::ready && !trouble_ && !unwritable_ &&
         !stopping_ && !isOverdue(now);
}

void Connection::findReader() noexcept {
  if (callerMayRead(Clock::now())) {
    const auto next = std::find_if(sleepers_.begin(), sleepers_.end(),
                                   [](const Request* each) { return !each->isDone(); });
    if (next != sleepers_.end()) return (*next)->sleeper->notify_one();
    if (attentive_ || (queue_.empty() && watchesEnd_)) return;
  }
  if (waiting_) wake();
}

void Connection::sleep(Lock& lock, Request& request, TimePoint until) {
  std::condition_variable woken;
  sleepers_.push_back(&request);
  request.sleeper = &woken;
  woken.wait_until(lock, until);
  request.sleeper = nullptr;
  sleepers_.erase(std::find(sleepers_.begin(), sleepers_.end(), &request));
}

void Connection::startThread() {
  if (!wake_) wake_ = FileDescriptor(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (!wake_) throw std::system_error(errno, std::generic_category());
  if (!forkMark_.isSet()) forkMark_.set();
  thread_ = startQuietThread(&Connection::run, this);
}

void Connection::wake() noexcept { ::eventfd_write(wake_.get(), 1); }

void Connection::flush() {
  blocked_ = false;
  std::array<iovec, kMostParts> parts;
  for (int i = 0; i < kWritesInARow && !unwritable_; ++i) {
    msghdr message = {};
    message.msg_iov = parts.data();
    message.msg_iovlen = queue_.gather(parts);
    if (message.msg_iovlen == 0) return;
    const ssize_t count = ::sendmsg(socket_, &message, MSG_NOSIGNAL | MSG_DONTWAIT);
    if (count >= 0) {
      queue_.sent(static_cast<std::size_t>(count));
    } else if (errno == EAGAIN) {
      break;
    } else if (errno != EINTR) {
      unwritable_ = true;  // what it has still said is read before it is given up
    }
  }
  blocked_ = queue_.hasUnsent();
}

/// Leaves everything but replies that are in order to the connection's thread. Nothing in it throws
/// or is cancelled: whoever takes the turn gives it up.
void Connection::readUntilDone(Lock& lock, const Request& request, TimePoint until) {
  reader_ = Reader::caller;
  do {
    flush();
    if (blocked_ && waiting_) wake();
    const TimePoint soonest = std::min(until, queue_.expiry().value_or(TimePoint::max()));
    lock.unlock();
    Came came = Came::nothing;
    bool ended = false;
    const auto look = [&] { return (came = readSome()) != Came::nothing; };
    if (Clock::now() >= soonest) {
      look();
    } else {
      callersWait_(look, [&] {
        ended = waitForReplies(soonest);
        look();  // also when it has ended: it may have answered after the socket was looked at
      });
    }
    lock.lock();
    callersTurn_ = true;
    if (came != Came::nothing || ended) trouble_ = take(lock, came);
  } while (!request.isDone() && !trouble_ && !unwritable_ && !stopping_ &&
           Clock::now() < std::min(until, queue_.expiry().value_or(TimePoint::max())));
  reader_ = Reader::nobody;
  if (stopping_) readerLeft_.notify_all();
  findReader();
}

bool Connection::waitForReplies(TimePoint until) const noexcept {
  std::array<pollfd, 2> fds = {{{process_->socket(), POLLIN, 0}, {process_->endedFd(), POLLIN, 0}}};
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(until - Clock::now());
  const auto wait = std::clamp<std::chrono::milliseconds>(left, 0ms, 1h);
  return ::poll(fds.data(), fds.size(), static_cast<int>(wait.count())) > 0 && fds[0].revents == 0;
}

Connection::Came Connection::readSome() noexcept {
  std::span<char> room;
  try {
    room = assembler_->room();
  } catch (const std::bad_alloc&) {
    return Came::tooMuch;
  }
  const ssize_t count = ::recv(process_->socket(), room.data(), room.size(), 0);
  if (count <= 0) {
    return count < 0 && (errno == EAGAIN || errno == EINTR) ? Came::nothing : Came::end;
  }
  assembler_->commit(static_cast<std::size_t>(count));
  return Came::bytes;
}

std::optional<std::string> Connection::take(Lock& lock, Came came) {
  if (came == Came::nothing || came == Came::end) return "";
  std::optional<std::string> wrong;
  try {
    if (came == Came::tooMuch) throw std::bad_alloc();
    if (state_ == State::greeting) {
      if (const std::optional<Data> body = assembler_->next()) {
        const std::string objection = greet(*body);
        if (!objection.empty()) return "cannot be used: " + objection;
      }
    }
    if (state_ == State::ready) settle(lock);
    if (state_ == State::ready && assembler_->midFrame() && !queue_.owesAny()) {
      wrong = violation("sent bytes that nobody asked for");
    }
  } catch (const frames::FrameError& broken) {
    wrong = violation("sent a broken frame: ", broken.what());
  } catch (const frames::RecordError& broken) {
    wrong = violation("sent a broken record: ", broken.what());
  } catch (const std::bad_alloc&) {
    wrong = violation("sent more than there is memory for");
  }
  if (!lock.owns_lock()) lock.lock();
  return wrong;
}

std::string Connection::greet(const Data& body) {
  std::string objection = objectionTo(frames::parseHello(body));
  if (!objection.empty()) return objection;
  startFailures_ = 0;
  state_ = State::ready;
  socket_ = process_->socket();
  queue_.restart(Clock::now());
  return objection;
}

std::exception_ptr Connection::collect() noexcept {
  try {
    while (answers_.size() < kAtOnce) {
      const std::optional<Data> body = assembler_->next();
      if (!body) break;
      answers_.push_back({frames::parseReply(*body), nullptr, nullptr});
    }
  } catch (...) {
    return std::current_exception();
  }
  return nullptr;
}

std::exception_ptr Connection::resolve() noexcept {
  std::exception_ptr wrong;
  for (Answer& answer : answers_) {
    try {
      if (answer.request == nullptr || answer.request->isDone()) {
        throw frames::FrameError("a reply to no request");
      }
      answer.request->resolve(answer.reply);
    } catch (...) {
      answer.request = nullptr;
      if (!wrong) wrong = std::current_exception();
    }
  }
  return wrong;
}

void Connection::settle(Lock& lock) {
  for (bool more = true; more;) {
    lock.unlock();
    const std::exception_ptr broken = collect();
    more = answers_.size() == kAtOnce;
    lock.lock();
    // They stay where they are without the lock: only the reader takes requests out.
    for (Answer& answer : answers_) answer.request = queue_.owed(answer.reply.id);
    lock.unlock();
    const std::exception_ptr wrong = resolve();
    lock.lock();
    const TimePoint now = Clock::now();
    for (Answer& answer : answers_) {
      if (answer.request == nullptr) continue;
      admission_.leave(answer.request->cost());
      answer.done = queue_.finish(answer.reply.id, now);
      if (answer.done->sleeper != nullptr) answer.done->sleeper->notify_one();
    }
    lock.unlock();
    answers_.clear();
    if (wrong) std::rethrow_exception(wrong);
    if (broken) std::rethrow_exception(broken);
    lock.lock();
  }
}

}  // namespace ironmoat::client
