#pragma once

#include <cstddef>
#include <list>

#include "client/connection.h"
#include "process/file_descriptor.h"

namespace ironmoat::client {

/// Many requests at once over several processes, without a thread. Used by one thread at a time,
/// but for `wait`, which may run beside the other functions.
///
/// A request goes to the first process that takes it. Small messages share a process, up to
/// Channel::kWindow; a large one gets a process to itself. When the front of a process is in work
/// for longer than kPatience, the requests behind it move on to others. So nothing large or slow
/// holds up what is small while another process is free or may be started.
class Engine {
 public:
  /// What `wait` saw.
  enum class Seen : std::uint8_t { nothing, socket, endOfProcess };

  /// Throws std::system_error when the descriptor cannot be had.
  explicit Engine(Context& context);

  /// A request that is cancelled before it was given to a process is not sent.
  void add(RequestList requests) noexcept { append(waiting_, requests); }
  /// Does all that can be done now. Complete requests are in `finished`.
  void step(Seen seen = Seen::nothing) noexcept;
  [[nodiscard]] RequestList& finished() noexcept { return finished_; }

  /// Readable when there is something to do; so is the passing of `wakeAt`.
  [[nodiscard]] int fd() const noexcept { return epoll_.get(); }
  [[nodiscard]] TimePoint wakeAt() const noexcept;
  /// Waits for `fd` for so many milliseconds, -1 for ever; the result is for the next `step`.
  [[nodiscard]] Seen wait(int milliseconds) const noexcept;
  /// Enough requests were added to be worth a `step`.
  [[nodiscard]] bool isWorthSending() const noexcept;
  /// Every request fails with `unavailable`, and every process ends.
  void stop(std::string_view why) noexcept;

 private:
  static constexpr std::size_t kLarge = std::size_t{64} << 10;  // bytes of a message
  static constexpr auto kPatience = std::chrono::milliseconds(20);

  struct Member {
    Member(Context& context, int epoll) : connection(context, epoll) {}
    [[nodiscard]] Channel& channel() noexcept { return connection.channel(); }
    [[nodiscard]] const Channel& channel() const noexcept { return connection.channel(); }
    Connection connection;
    TimePoint usedAt;
    bool hasLarge = false;  // the request added last is a large one
  };

  static bool isLarge(const Request& request) noexcept { return request.message().size() > kLarge; }
  static bool takes(Member& member, const Request& request, TimePoint now) noexcept;
  Member* memberFor(const Request& request, TimePoint now) noexcept;
  void dispatch(TimePoint now) noexcept;
  void moveFollowers(Channel& channel, TimePoint now) noexcept;
  void endIdle(TimePoint now) noexcept;

  Context& context_;
  process::FileDescriptor epoll_;
  std::list<Member> members_;
  RequestList waiting_;
  RequestList finished_;
};

}  // namespace ironmoat::client
