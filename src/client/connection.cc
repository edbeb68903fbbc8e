#include "client/connection.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <new>
#include <system_error>
#include <utility>

#include "client/greeting.h"
#include "client/quiet_thread.h"
#include "frames/record_codec.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {
constexpr int kWritesInARow = 4;                 // before replies are looked at again
constexpr std::size_t kAtOnce = 64;              // replies given out together, at most
constexpr std::size_t kMostParts = 2 * kAtOnce;  // of a write: two for each request
}  // namespace

Connection::Connection(Client::Options options)
    : program_(std::move(options.program)),
      deadline_(std::clamp<std::chrono::milliseconds>(options.deadline, 1ms, 24h)),
      admission_(options.maxBytesInFlight),
      queue_(deadline_) {
  answers_.reserve(kAtOnce);
}

Connection::~Connection() {
  {
    const Lock lock(mutex_);
    stopping_ = true;
    admission_.stop();
    if (wake_) wake();
  }
  if (thread_.joinable()) thread_.join();
}

void Connection::submit(std::unique_ptr<Request> request, Then then) {
  const auto refuse = [&](const std::string& why) {
    request->fail(std::make_exception_ptr(ServiceError(ServiceError::Kind::unavailable, why)));
  };
  if (inForkedChild()) return refuse("this client belongs to the process that forked this one");
  Lock lock(mutex_);
  try {
    if (!thread_.joinable()) startThread();
  } catch (const std::system_error& error) {
    return refuse(std::string("cannot start the client's thread: ") + error.what());
  }
  const std::size_t cost = request->cost();
  if (!admission_.enter(lock, cost)) return refuse("the client is being destroyed");
  const bool othersFirst = queue_.hasUnsent();
  const bool wasBlocked = blocked_;
  const TimePoint now = Clock::now();
  std::uint64_t id = 0;
  try {
    id = queue_.push(std::move(request), now);
  } catch (...) {
    admission_.leave(cost);
    throw;
  }
  if (then == Then::returns) lastSubmit_ = now;
  // Others may follow it: held back for a moment, many are sent with one system call, by whoever
  // submits the last of them or by the reader, as soon as a reply comes.
  const bool held =
      then == Then::returns && attentive_ && reader_ != Reader::nobody && !queue_.isWorthSending();
  if (state_ == State::ready && !blocked_ && !held) flush();

  const bool stuck = state_ != State::ready || blocked_;
  if (then == Then::waits && reader_ == Reader::nobody && !stuck && !trouble_) {
    return readUntilAnswered(lock, id);
  }
  const bool news = state_ == State::ready ? blocked_ && !wasBlocked : !othersFirst;
  if (waiting_ && (news || reader_ == Reader::nobody)) wake();
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

/// Leaves everything but replies that are in order to the connection's thread.
void Connection::readUntilAnswered(Lock& lock, std::uint64_t id) {
  struct Turn {  // ends also when the calling thread is cancelled
    Turn(Connection& of, Lock& held) : connection(of), lock(held) {
      connection.reader_ = Reader::caller;
    }
    ~Turn() {
      if (!lock.owns_lock()) lock.lock();
      connection.reader_ = Reader::nobody;
      if (!orderly || !connection.queue_.empty() || !connection.watchesEnd_) connection.wake();
    }
    Connection& connection;
    Lock& lock;
    bool orderly = false;
  };
  Turn turn(*this, lock);
  while (!stopping_ && queue_.owed(id) != nullptr) {
    std::array<pollfd, 2> fds = {
        {{process_->socket(), POLLIN, 0}, {process_->endedFd(), POLLIN, 0}}};
    const auto expiry = queue_.expiry().value_or(TimePoint::max());
    const int timeout = readerTimeout(Clock::now());
    const bool lookedOut = attentive_;
    lock.unlock();
    const int count = ::poll(fds.data(), fds.size(), timeout);
    const int error = errno;
    lock.lock();
    if (count < 0 && error == EINTR) continue;
    if (count > 0 && (fds[0].revents & POLLIN) != 0) {
      attentive_ = true;
      trouble_ = receive(lock);
      if (trouble_ || Clock::now() >= expiry) return;
    } else if (count != 0 || !lookedOut) {
      return;
    }
    flush();
    if (blocked_ && waiting_) wake();
  }
  turn.orderly = true;
}

std::optional<std::string> Connection::receive(Lock& lock) {
  lock.unlock();
  const std::span<char> room = assembler_->room();
  const ssize_t count = ::recv(process_->socket(), room.data(), room.size(), 0);
  if (count <= 0) {
    const int error = errno;
    lock.lock();
    if (count < 0 && (error == EAGAIN || error == EINTR)) return std::nullopt;
    return "";
  }
  assembler_->commit(static_cast<std::size_t>(count));
  stirred_ = true;
  std::optional<std::string> violation;
  try {
    lock.lock();
    if (state_ == State::greeting) {
      if (const std::optional<Data> body = assembler_->next()) {
        const std::string objection = greet(*body);
        if (!objection.empty()) return "cannot be used: " + objection;
      }
    }
    if (state_ == State::ready) settle(lock);
    if (state_ == State::ready && assembler_->midFrame() && !queue_.owesAny()) {
      violation = "sent bytes that nobody asked for";
    }
  } catch (const frames::FrameError& broken) {
    violation = std::string("sent a broken frame: ") + broken.what();
  } catch (const frames::RecordError& broken) {
    violation = std::string("sent a broken record: ") + broken.what();
  } catch (const std::bad_alloc&) {
    violation = "sent more than there is memory for";
  }
  if (!lock.owns_lock()) lock.lock();
  return violation;
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

/// Newest first: who waits for them in the order of their submission is woken once, when all are
/// there, and not for each anew.
std::exception_ptr Connection::resolve() noexcept {
  std::exception_ptr wrong;
  for (std::size_t i = answers_.size(); i-- > 0;) {
    Answer& answer = answers_[i];
    try {
      if (answer.request == nullptr || answer.request->isResolved()) {
        throw frames::FrameError("a reply to no request");
      }
      answer.request->resolve(answer.reply);
    } catch (...) {
      answer.request = nullptr;
      wrong = std::current_exception();
    }
  }
  return wrong;
}

void Connection::settle(Lock& lock) {
  for (bool more = true; more;) {
    lock.unlock();
    std::exception_ptr wrong = collect();
    more = answers_.size() == kAtOnce;
    lock.lock();
    // They stay where they are without the lock: only the reader takes requests out.
    for (Answer& answer : answers_) answer.request = queue_.owed(answer.reply.id);
    lock.unlock();
    if (const std::exception_ptr other = resolve()) wrong = other;
    lock.lock();
    const TimePoint now = Clock::now();
    for (Answer& answer : answers_) {
      if (answer.request == nullptr) continue;
      admission_.leave(answer.request->cost());
      answer.done = queue_.finish(answer.reply.id, now);
    }
    lock.unlock();
    answers_.clear();
    if (wrong) std::rethrow_exception(wrong);
    lock.lock();
  }
}

}  // namespace ironmoat::client
