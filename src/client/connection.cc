#include "client/connection.h"

#include <poll.h>
#include <sys/epoll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <string>
#include <utility>

#include "client/greeting.h"
#include "frames/record_codec.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {

constexpr Clock::duration kMinStartTime = 2s;
/// That a process may take to send its hello.
Clock::duration startTime(const Settings& settings) noexcept {
  return std::max(settings.deadline, kMinStartTime);
}

constexpr int kReadsInARow = 4;         // before anything else is looked at
constexpr std::size_t kMaxParts = 128;  // of a write

}  // namespace

Connection::Connection(const Settings& settings, Counters& counters, int epoll)
    : settings_(settings), channel_(startTime(settings), counters), epoll_(epoll) {}

Connection::~Connection() {
  if (process_) dismiss();
}

void Connection::pull() noexcept {
  for (int i = 0; i < kReadsInARow && process_ && receive(); ++i) {
  }
  if (std::optional<Loss> loss = channel_.expire(Clock::now())) lose(*std::move(loss));
}

void Connection::push() noexcept {
  if (const TimePoint now = Clock::now(); channel_.wantsProcess(now)) start(now);
  if (process_ && channel_.isWorthSending()) send();
  if (epoll_ >= 0 && process_) watch();
}

void Connection::start(TimePoint now) noexcept {
  try {
    process_ = std::make_unique<Process>(ServiceProcess::start(settings_.program));
    startedAt_ = now;
    channel_.started(now);
  } catch (const StartError& error) {
    channel_.startFailed(error.what(), error.lasting(), now);
  } catch (const std::bad_alloc& error) {
    channel_.startFailed(error.what(), false, now);
  }
}

void Connection::send() noexcept {
  std::array<iovec, kMaxParts> parts;
  msghdr message = {};
  message.msg_iov = parts.data();
  while (channel_.hasUnsent()) {
    message.msg_iovlen = channel_.gather(parts);
    const ssize_t count =
        ::sendmsg(process_->service.socket(), &message, MSG_NOSIGNAL | MSG_DONTWAIT);
    if (count >= 0) {
      channel_.sent(static_cast<std::size_t>(count));
      continue;
    }
    if (errno == EAGAIN || errno == EINTR) return;
    // It no longer reads. What it has still said counts first.
    while (process_ && receive()) {
    }
    if (process_) lose({});
    return;
  }
}

Connection::Received Connection::readSome(Process& process) {
  const std::span<char> room = process.assembler.room();
  const ssize_t count = ::recv(process.service.socket(), room.data(), room.size(), MSG_DONTWAIT);
  if (count > 0) process.assembler.commit(static_cast<std::size_t>(count));
  if (count > 0) return Received::bytes;
  return count < 0 && (errno == EAGAIN || errno == EINTR) ? Received::nothing : Received::end;
}

bool Connection::receive() noexcept {
  const auto wrong = [&](std::string_view what, const char* how) {
    lose({Loss::Why::violation, textOrNone([&] { return std::string(what).append(how); })});
    return true;
  };
  try {
    const Received received = readSome(*process_);
    if (received == Received::nothing) return false;
    if (received == Received::end) {
      lose({});
      return true;
    }
    const TimePoint now = Clock::now();
    while (const std::optional<Data> body = process_->assembler.next()) {
      channel_.receive(*body, now);
    }
    if (process_->assembler.midFrame() && !channel_.owesReply() &&
        channel_.state() == Channel::State::ready) {
      return wrong("sent unsolicited data", "");
    }
    return true;
  } catch (const frames::FrameError& error) {
    return wrong(
        channel_.state() == Channel::State::greeting ? "is unusable: " : "sent a broken frame: ",
        error.what());
  } catch (const frames::RecordError& error) {
    return wrong("sent a broken record: ", error.what());
  } catch (const std::bad_alloc&) {
    return wrong("sent more than there is memory for", "");
  }
}

void Connection::lose(Loss loss) noexcept {
  unwatch();
  const bool greeting = channel_.state() == Channel::State::greeting;
  loss.what = textOrNone([&] {
    std::string what = std::move(loss.what);
    if (loss.why == Loss::Why::ended) {
      what = process_->service.lastWord(kGrace);
      if (greeting) what += " before its hello";
    }
    return greeting ? settings_.program + " " + what : what;
  });
  process_.reset();  // gone before anyone hears of it
  channel_.lost(loss, Clock::now());
}

void Connection::dismiss() noexcept {
  unwatch();
  successor_.reset();
  process_.reset();
  channel_.dismissed();
}

bool Connection::isDue(TimePoint now) const noexcept {
  if (successor_ != nullptr) return true;
  return now >= renewAfter_ &&
         (channel_.answered() >= settings_.requestsPerProcess ||
          now - startedAt_ >= settings_.processLifetime || channel_.slowInARow() >= kSlowInARow);
}

bool Connection::wantsRest(TimePoint now) noexcept {
  if (channel_.state() != Channel::State::ready || !isDue(now)) return false;
  try {
    return !successor_ || hasSuccessor();
  } catch (const std::exception&) {
    return true;  // `renew` will see it again
  }
}

void Connection::renew() noexcept {
  const TimePoint now = Clock::now();
  if (!process_ || channel_.state() != Channel::State::ready || !isDue(now)) return;
  try {
    if (!successor_) {
      successor_ = std::make_unique<Process>(ServiceProcess::start(settings_.program));
      successorGreeted_ = false;
      successorStartedAt_ = now;
    } else if (hasSuccessor()) {
      unwatch();
      process_ = std::move(successor_);
      startedAt_ = now;
      channel_.replaced();
    }
  } catch (const std::exception&) {  // not to be had now: the present one goes on
    successor_.reset();
    renewAfter_ = now + kRenewPause;
  }
}

bool Connection::hasSuccessor() {
  if (successorGreeted_) return true;
  if (Clock::now() - successorStartedAt_ > startTime(settings_)) {
    throw StartError("sent no hello before the start deadline", false);
  }
  if (readSome(*successor_) == Received::end) throw StartError("ended before its hello", false);
  if (const std::optional<Data> body = successor_->assembler.next()) {
    requireUsable(frames::parseHello(*body));
    successorGreeted_ = true;
  }
  return successorGreeted_;
}

void Connection::processEnded() noexcept {
  if (process_ && !receive()) lose({});
}

bool Connection::spin() noexcept {
  return process_ && channel_.owesReply() && spin_([&] { return receive(); });
}

void Connection::wait() noexcept {
  if (spin()) return;
  std::array<pollfd, 2> fds = {{{-1, POLLIN, 0}, {-1, POLLIN, 0}}};
  if (process_) {
    fds[0].fd = process_->service.socket();
    if (channel_.isWorthSending()) fds[0].events |= POLLOUT;
    fds[1].fd = process_->service.endedFd();
  }
  ::poll(fds.data(), fds.size(), millisecondsUntil(channel_.wakeAt()));
  // A child that the daemon has forked may keep the connection open.
  if (fds[0].revents == 0 && fds[1].revents != 0) processEnded();
}

void Connection::watch() noexcept {
  const unsigned wanted = EPOLLIN | (channel_.isWorthSending() ? unsigned{EPOLLOUT} : 0U);
  if (watched_ == wanted) return;
  epoll_event event = {};
  event.events = wanted;
  ::epoll_ctl(epoll_, watched_ == 0 ? EPOLL_CTL_ADD : EPOLL_CTL_MOD, process_->service.socket(),
              &event);
  if (watched_ == 0 && process_->service.endedFd() >= 0) {
    event.events = EPOLLIN;
    event.data.ptr = this;
    ::epoll_ctl(epoll_, EPOLL_CTL_ADD, process_->service.endedFd(), &event);
  }
  watched_ = wanted;
}

void Connection::unwatch() noexcept {
  if (std::exchange(watched_, 0) == 0) return;
  ::epoll_ctl(epoll_, EPOLL_CTL_DEL, process_->service.socket(), nullptr);
  if (process_->service.endedFd() >= 0) {
    ::epoll_ctl(epoll_, EPOLL_CTL_DEL, process_->service.endedFd(), nullptr);
  }
}

}  // namespace ironmoat::client
