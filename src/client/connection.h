#pragma once

#include <memory>
#include <optional>

#include "client/channel.h"
#include "client/context.h"
#include "frames/frame_assembler.h"
#include "frames/spin.h"
#include "process/service_process.h"

namespace ironmoat::client {

/// A channel with its process: carries out what the channel asks for. Blocks only in `wait` and,
/// for at most kGrace, for the exit status of a process that has closed its connection. Used by one
/// thread at a time.
class Connection {
 public:
  /// `epoll`, unless it is -1, reports events of the socket with null, the end of the process with
  /// `this`.
  explicit Connection(Context& context, int epoll = -1);
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;
  ~Connection() { dismiss(); }

  [[nodiscard]] Channel& channel() noexcept { return channel_; }
  [[nodiscard]] const Channel& channel() const noexcept { return channel_; }
  /// Receives what has come and checks the deadlines.
  void pull() noexcept;
  /// Starts the process and sends, where there is something to send.
  void push() noexcept;
  /// Blocks until there may be something to do, after a short spin.
  void wait() noexcept;
  /// Looks whether the process has ended: a child that the daemon forked may keep its connection
  /// open. Costs a system call, so it is for when the end was reported.
  void checkEnd() noexcept;
  /// Ends the process, which owes no reply.
  void dismiss() noexcept;

  /// Replaces a process that is due for it by a successor, which is started first and takes over
  /// once it has sent its hello and the channel is empty. To be called between requests.
  void renew() noexcept;
  /// The successor is ready: no request should be added before it took over.
  [[nodiscard]] bool isYielding() const noexcept {
    return successor_ && successor_->hello && channel_.state() == Channel::State::ready;
  }

 private:
  static constexpr auto kGrace = std::chrono::milliseconds(100);

  struct Process {
    process::ServiceProcess service;
    TimePoint startedAt;
    frames::FrameAssembler assembler{frames::kMaxReplyBody, Sharing::anyThread};
    std::optional<Data> hello{};  // a successor's, which is usable
  };

  [[nodiscard]] std::unique_ptr<Process> startProcess() const;
  void start(TimePoint now) noexcept;
  /// Reads the successor's hello, if it has come. Throws when the successor is of no use.
  void greetSuccessor(TimePoint now);
  void send() noexcept;
  /// Reads once and hands what came to the channel; returns whether anything came.
  bool receive() noexcept;
  void lose(Loss loss) noexcept;
  [[nodiscard]] bool watch(unsigned events) noexcept;
  [[nodiscard]] bool isDue(TimePoint now) const noexcept;

  Context& context_;
  Channel channel_;
  const int epoll_;
  std::unique_ptr<Process> process_;
  std::unique_ptr<Process> successor_;
  TimePoint renewAfter_{};
  unsigned watched_ = 0;  // events of the socket that `epoll_` reports; 0: not registered
  frames::Spin spin_;
};

}  // namespace ironmoat::client
