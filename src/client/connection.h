#pragma once

#include <memory>
#include <optional>

#include "client/channel.h"
#include "client/service_process.h"
#include "client/settings.h"
#include "frames/frame_assembler.h"
#include "frames/spin.h"

namespace ironmoat::client {

/// A channel with its process: carries out what the channel asks for. Waits nowhere but in `wait`
/// and, for at most kGrace, for the status of a process that has closed its connection. Used by one
/// thread at a time.
class Connection {
 public:
  /// The descriptors that matter are kept in `epoll`, if that is not -1.
  Connection(const Settings& settings, Counters& counters, int epoll = -1);
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;
  ~Connection();

  [[nodiscard]] Channel& channel() noexcept { return channel_; }
  /// Receives what has come and looks at the deadlines.
  void pull() noexcept;
  /// Starts the process and sends, where there is something to send.
  void push() noexcept;
  /// Waits for a moment for a reply that is owed; returns whether something came.
  bool spin() noexcept;
  /// Waits until there may be something to do, spinning first.
  void wait() noexcept;
  /// Ends the process, which owes no reply.
  void dismiss() noexcept;

  /// The process has ended, whoever keeps its connection open.
  void processEnded() noexcept;
  /// The process is to be replaced and has to be idle for that: no request should be added.
  [[nodiscard]] bool wantsRest(TimePoint now) noexcept;
  /// To be called when the channel is empty. A process that is due for replacement is replaced once
  /// its successor, started here, has sent its hello; until then it goes on.
  void renew() noexcept;

 private:
  static constexpr auto kGrace = std::chrono::milliseconds(100);
  static constexpr unsigned kSlowInARow = 3;
  static constexpr auto kRenewPause = std::chrono::seconds(1);  // after a successor that failed

  struct Process {
    explicit Process(ServiceProcess started)
        : service(std::move(started)), assembler(frames::kMaxReplyBody, Sharing::anyThread) {}
    ServiceProcess service;
    frames::FrameAssembler assembler;
  };
  enum class Received : std::uint8_t { nothing, bytes, end };

  void start(TimePoint now) noexcept;
  void send() noexcept;
  /// Reads once, and gives what came to the channel.
  bool receive() noexcept;
  static Received readSome(Process& process);
  void lose(Loss loss) noexcept;
  void watch() noexcept;
  void unwatch() noexcept;
  [[nodiscard]] bool isDue(TimePoint now) const noexcept;
  bool hasSuccessor();

  const Settings& settings_;
  Channel channel_;
  const int epoll_;
  std::unique_ptr<Process> process_;
  std::unique_ptr<Process> successor_;
  bool successorGreeted_ = false;
  TimePoint successorStartedAt_{};
  TimePoint startedAt_{};
  TimePoint renewAfter_{};
  unsigned watched_ = 0;  // events of the socket that `epoll_` waits for; 0: not in it
  frames::Spin spin_;
};

}  // namespace ironmoat::client
