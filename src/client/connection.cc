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
constexpr int kWritesInARow = 4;  // before replies are looked at again
}

Connection::Connection(Client::Options options)
    : program_(std::move(options.program)),
      deadline_(std::clamp<std::chrono::milliseconds>(options.deadline, 1ms, 24h)),
      admission_(options.maxBytesInFlight),
      queue_(deadline_) {}

Connection::~Connection() {
  {
    const Lock lock(mutex_);
    stopping_ = true;
    admission_.stop();
    if (wake_) wake();
  }
  if (thread_.joinable()) thread_.join();
}

bool Connection::inForkedChild() const noexcept {
  const pid_t owner = owner_.load(std::memory_order_relaxed);
  return owner != 0 && owner != ::getpid();
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
  const TimePoint now = Clock::now();
  std::uint64_t id = 0;
  try {
    id = queue_.push(std::move(request), now);
  } catch (...) {
    admission_.leave(cost);
    throw;
  }
  if (then == Then::returns) lastSubmit_ = now;
  if (state_ == State::ready && !othersFirst) flush();

  const bool stuck = state_ != State::ready || queue_.hasUnsent();
  if (then == Then::waits && reader_ == Reader::nobody && !stuck && !trouble_) {
    return readUntilAnswered(lock, id);
  }
  if (waiting_ && ((stuck && !othersFirst) || reader_ == Reader::nobody)) wake();
}

void Connection::startThread() {
  if (!wake_) wake_ = FileDescriptor(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (!wake_) throw std::system_error(errno, std::generic_category());
  owner_.store(::getpid(), std::memory_order_relaxed);
  thread_ = startQuietThread(&Connection::run, this);
}

void Connection::wake() noexcept { ::eventfd_write(wake_.get(), 1); }

void Connection::flush() {
  std::array<iovec, 64> parts;
  for (int i = 0; i < kWritesInARow && !unwritable_; ++i) {
    msghdr message = {};
    message.msg_iov = parts.data();
    message.msg_iovlen = queue_.gather(parts);
    if (message.msg_iovlen == 0) return;
    const ssize_t count = ::sendmsg(socket_, &message, MSG_NOSIGNAL | MSG_DONTWAIT);
    if (count >= 0) {
      queue_.sent(static_cast<std::size_t>(count));
    } else if (errno == EAGAIN) {
      return;
    } else if (errno != EINTR) {
      unwritable_ = true;  // what it has still said is read before it is given up
    }
  }
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
    const int timeout = waitMilliseconds(Clock::now());
    lock.unlock();
    const int count = ::poll(fds.data(), fds.size(), timeout);
    const int error = errno;
    lock.lock();
    if (count < 0 && error == EINTR) continue;
    if (count <= 0 || (fds[0].revents & POLLIN) == 0) return;
    trouble_ = receive(lock);
    if (trouble_ || Clock::now() >= expiry) return;
    flush();
    if (queue_.hasUnsent() && waiting_) wake();
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
  std::optional<std::string> violation;
  try {
    while (const auto body = assembler_->next()) {
      lock.lock();
      if (state_ == State::greeting) {
        const std::string objection = greet(*body);
        if (!objection.empty()) return "cannot be used: " + objection;
        lock.unlock();
      } else {
        const std::unique_ptr<Request> done = settle(lock, *body);
        lock.unlock();
      }
    }
    lock.lock();
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

std::unique_ptr<Request> Connection::settle(Lock& lock, const Data& body) {
  const frames::Reply reply = frames::parseReply(body);
  // Stays where it is without the lock: only the reader takes requests out.
  Request* request = queue_.owed(reply.id);
  if (request == nullptr) throw frames::FrameError("a reply to no request");
  lock.unlock();
  request->resolve(reply);
  lock.lock();
  admission_.leave(request->cost());
  return queue_.finish(reply.id, Clock::now());
}

}  // namespace ironmoat::client
