#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "client/connection.h"
#include "client/file_descriptor.h"
#include "client/settings.h"

namespace ironmoat::client {

/// Many requests at once over several processes, without a thread: what EventLoopClient and
/// Client's background thread run on. Used by one thread at a time.
///
/// A request goes to the first process that takes it. Small messages share a process, up to
/// Channel::kWindow; a large one gets a process to itself. When the front of a process is in work
/// for longer than kPatience, the requests behind it move on to others. So nothing large or slow
/// holds up what is small while another process is free or may be started.
class Engine {
 public:
  /// Throws std::system_error when the descriptor cannot be had.
  Engine(const Settings& settings, Counters& counters);

  void add(std::shared_ptr<Request> request) noexcept { waiting_.push(std::move(request)); }
  void cancel(Request& request) noexcept;

  /// Readable when there is something to do; so is the passing of `wakeAt`.
  [[nodiscard]] int fd() const noexcept { return epoll_.get(); }
  [[nodiscard]] TimePoint wakeAt() const noexcept;
  /// Waits for a descriptor in `fd` for so many milliseconds, -1 for ever.
  void wait(int milliseconds) noexcept;
  /// Requests that have to be added before another `step` is worth while the processes have work.
  [[nodiscard]] std::size_t worthAdding() const noexcept;
  /// Does all that can be done now. Requests with an outcome are in `finished`.
  void step() noexcept;
  [[nodiscard]] RequestList& finished() noexcept { return finished_; }
  /// Every request fails with `unavailable`, and every process ends.
  void stop(std::string_view why) noexcept;

 private:
  static constexpr std::size_t kLarge = std::size_t{64} << 10;  // bytes of a message
  static constexpr auto kPatience = std::chrono::milliseconds(20);

  struct Member {
    std::unique_ptr<Connection> connection;
    TimePoint usedAt;
    bool hasLarge = false;  // the request given last was a large one
  };

  static bool isLarge(const Request& request) noexcept { return request.message().size() > kLarge; }
  static bool takes(const Member& member, const Request& request, TimePoint now) noexcept;
  Member* memberFor(const Request& request, TimePoint now) noexcept;
  void dispatch(TimePoint now) noexcept;
  void moveFollowers(Connection& connection, TimePoint now) noexcept;
  void endIdle(TimePoint now) noexcept;
  void fail(std::shared_ptr<Request> request, Failure failure) noexcept;

  const Settings& settings_;
  Counters& counters_;
  FileDescriptor epoll_;
  std::vector<Member> members_;
  RequestList waiting_;
  RequestList finished_;
};

}  // namespace ironmoat::client
