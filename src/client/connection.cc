#include "client/connection.h"

#include <poll.h>
#include <sys/epoll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <string>
#include <utility>

#include "frames/record_codec.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {

constexpr auto kMinStartTime = 2s;
constexpr int kReadsInARow = 4;  // before anything else is looked at
constexpr unsigned kSlowInARow = 3;
constexpr auto kRenewPause = 1s;  // after a successor that failed

Clock::duration startTime(const Context& context) noexcept {
  return std::max<Clock::duration>(context.settings.deadline, kMinStartTime);
}

bool isReadable(int fd) noexcept {
  pollfd ready = {fd, POLLIN, 0};
  return ::poll(&ready, 1, 0) > 0;
}

}  // namespace

Connection::Connection(Context& context, int epoll)
    : context_(context), channel_(startTime(context), context.counters), epoll_(epoll) {}

void Connection::pull() noexcept {
  for (int i = 0; i < kReadsInARow && process_ && receive(); ++i) {
  }
  if (std::optional<Loss> loss = channel_.expire(Clock::now())) lose(*std::move(loss));
}

void Connection::push() noexcept {
  if (const TimePoint now = Clock::now(); channel_.wantsProcess(now)) start(now);
  if (process_ && channel_.isWorthSending()) send();
  if (process_ && !watch(EPOLLIN | (channel_.wantsRoom() ? unsigned{EPOLLOUT} : 0U))) {
    lose({Loss::Why::ended, textOrNone([] { return std::string("could not be watched"); })});
  }
}

std::unique_ptr<Connection::Process> Connection::startProcess() const {
  // NOLINTNEXTLINE(modernize-make-unique): of an aggregate it does not compile with clang 14
  return std::unique_ptr<Process>(
      new Process{process::ServiceProcess::start(context_.settings.program), Clock::now()});
}

void Connection::start(TimePoint now) noexcept {
  try {
    process_ = startProcess();
    channel_.started(now);
  } catch (const process::StartError& error) {
    channel_.startFailed(error.what(), error.lasting(), now);
  } catch (const std::bad_alloc& error) {
    channel_.startFailed(error.what(), false, now);
  }
}

void Connection::send() noexcept {
  while (channel_.hasOutput()) {
    auto parts = channel_.output();
    msghdr message = {};
    message.msg_iov = parts.data();
    message.msg_iovlen = parts.size();
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
    return process_ ? lose({}) : void();
  }
}

bool Connection::receive() noexcept {
  using State = Channel::State;
  const auto violation = [](std::string_view what, const char* how) {
    return Loss{Loss::Why::violation, textOrNone([&] { return std::string(what).append(how); })};
  };
  Loss loss;
  try {
    const std::span<char> room = process_->assembler.room();
    const ssize_t count =
        ::recv(process_->service.socket(), room.data(), room.size(), MSG_DONTWAIT);
    if (count < 0 && (errno == EAGAIN || errno == EINTR)) return false;
    if (count > 0) {
      process_->assembler.commit(static_cast<std::size_t>(count));
      const TimePoint now = Clock::now();
      while (const std::optional<Data> body = process_->assembler.next()) {
        channel_.receive(*body, now);
      }
      const bool isUnsolicited = process_->assembler.midFrame() && channel_.inFlight() == 0 &&
                                 channel_.state() == State::ready;
      if (!isUnsolicited) return true;
      loss = violation("sent unsolicited data", "");
    }
  } catch (const frames::FrameError& error) {
    const bool greeting = channel_.state() == State::greeting;
    loss = violation(greeting ? "is unusable: " : "sent a broken frame: ", error.what());
  } catch (const frames::RecordError& error) {
    loss = violation("sent a broken record: ", error.what());
  } catch (const std::bad_alloc&) {
    loss = violation("sent more than there is memory for", "");
  }
  lose(std::move(loss));
  return true;
}

void Connection::lose(Loss loss) noexcept {
  const bool greeting = channel_.state() == Channel::State::greeting;
  loss.what = textOrNone([&] {
    std::string what = std::move(loss.what);
    if (what.empty()) {
      what = process_->service.lastWord(kGrace);
      if (greeting) what += " before its hello";
    }
    return greeting ? context_.settings.program + " " + what : what;
  });
  static_cast<void>(watch(0));
  process_.reset();  // gone before anyone hears of it
  channel_.lost(loss, Clock::now());
  if (context_.settings.onProcessLost) context_.settings.onProcessLost(loss.what);
}

void Connection::dismiss() noexcept {
  successor_.reset();
  if (!process_) return;
  static_cast<void>(watch(0));
  process_.reset();
  channel_.dismissed();
}

bool Connection::isDue(TimePoint now) const noexcept {
  if (!process_ || channel_.state() != Channel::State::ready) return false;
  if (successor_) return true;
  return now >= renewAfter_ && (channel_.answered() >= context_.settings.requestsPerProcess ||
                                now - process_->startedAt >= context_.settings.processLifetime ||
                                channel_.slowInARow() >= kSlowInARow);
}

void Connection::greetSuccessor(TimePoint now) {
  const std::span<char> room = successor_->assembler.room();
  const ssize_t count =
      ::recv(successor_->service.socket(), room.data(), room.size(), MSG_DONTWAIT);
  if (count > 0) successor_->assembler.commit(static_cast<std::size_t>(count));
  std::optional<Data> hello = successor_->assembler.next();
  const bool isLate = !hello && now - successor_->startedAt > startTime(context_);
  if (count == 0 || isLate || (hello && successor_->assembler.midFrame())) {
    throw frames::FrameError("ended, sent no hello in time, or sent more than that");
  }
  if (hello) static_cast<void>(usableHello(*hello));
  successor_->hello = std::move(hello);
}

void Connection::renew() noexcept {
  const TimePoint now = Clock::now();
  if (!isDue(now)) return;
  try {
    if (!successor_) successor_ = startProcess();
    if (!successor_->hello) greetSuccessor(now);
  } catch (const std::exception&) {  // the present process goes on
    successor_.reset();
    renewAfter_ = now + kRenewPause;
  }
  if (!isYielding() || !channel_.empty()) return;
  std::unique_ptr<Process> next = std::move(successor_);
  dismiss();
  process_ = std::move(next);
  channel_.started(now);
  channel_.receive(*process_->hello, now);  // does not throw: this hello was accepted before
  context_.counters.add(&Stats::retired);
}

void Connection::checkEnd() noexcept {
  if (process_ && isReadable(process_->service.endedFd()) && !receive()) lose({});
}

void Connection::wait() noexcept {
  if (process_ && channel_.inFlight() > 0 && spin_([this] { return receive(); })) return;
  std::array<pollfd, 2> fds = {{{-1, POLLIN, 0}, {-1, POLLIN, 0}}};
  if (process_) {
    fds[0].fd = process_->service.socket();
    if (channel_.wantsRoom()) fds[0].events |= POLLOUT;
    fds[1].fd = process_->service.endedFd();
  }
  ::poll(fds.data(), fds.size(), millisecondsUntil(channel_.wakeAt()));
  if (fds[0].revents == 0 && fds[1].revents != 0) checkEnd();
}

/// Returns false when the kernel has no memory for it.
bool Connection::watch(unsigned events) noexcept {
  const unsigned before = std::exchange(watched_, events);
  if (epoll_ < 0 || before == events) return true;
  const int change = before == 0 ? EPOLL_CTL_ADD : events == 0 ? EPOLL_CTL_DEL : EPOLL_CTL_MOD;
  const auto apply = [&](int fd, unsigned reported, void* with) {
    epoll_event event = {};
    event.events = reported;
    event.data.ptr = with;
    return ::epoll_ctl(epoll_, change, fd, &event) == 0;
  };
  bool applied = apply(process_->service.socket(), events, nullptr);
  if (change != EPOLL_CTL_MOD && process_->service.endedFd() >= 0) {
    applied &= apply(process_->service.endedFd(), EPOLLIN, this);
  }
  return applied;
}

}  // namespace ironmoat::client
