#pragma once

#include <condition_variable>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "client/admission.h"
#include "client/file_descriptor.h"
#include "client/fork_mark.h"
#include "client/request_queue.h"
#include "client/service_process.h"
#include "frames/brief_wait.h"
#include "frames/frame_assembler.h"
#include "ironmoat/client.h"

namespace ironmoat::client {

/// Brings requests to a service process and their outcomes back, and keeps that process running.
///
/// A thread of its own, started with the first request, starts, watches and replaces the process.
/// Bytes are sent under the mutex, by that thread or by a submitting one, or together with others'
/// by who is about to wait for replies. They are read by one reader at a time. A thread that waits
/// for an outcome is the reader if it can be, since that saves waking another one for each; others
/// that wait sleep, and one of them follows when the reader leaves. Where nobody waits, or has not
/// for a tick, the connection's thread reads. Nobody waits in anything but poll, and the socket
/// never blocks, so that neither direction can hold up the other.
class Connection {
 public:
  using Clock = RequestQueue::Clock;
  using TimePoint = RequestQueue::TimePoint;

  explicit Connection(Client::Options options);
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;
  ~Connection() { stop(); }

  enum class Then : std::uint8_t { returns, waits };
  /// Waits while too many bytes are in flight. Every outcome goes to the request. `waits` says that
  /// the caller is going to `await` it at once.
  void submit(std::shared_ptr<Request> request, Then then);
  /// Whether the request, which was submitted here, is done; waits for that until `until`. In a
  /// forked child it fails.
  bool await(Request& request, TimePoint until);
  /// All without an outcome fail; leaves no process and no thread. Once, and not in a forked child.
  void stop() noexcept;

  /// This process is a copy of the one that uses the connection: nothing here may be touched, not
  /// even the mutex.
  [[nodiscard]] bool inForkedChild() const noexcept { return forkMark_.inCopy(); }

 private:
  using Lock = std::unique_lock<std::mutex>;
  /// The service is at work on what is waited for: so long it takes over half a pipeline.
  static constexpr auto kPatience = std::chrono::microseconds(50);
  enum class State : std::uint8_t { absent, greeting, ready };
  enum class Reader : std::uint8_t { nobody, caller, thread };
  enum class Came : std::uint8_t { nothing, bytes, tooMuch, end };

  // By any thread, under the mutex.
  void startThread();
  void wake() noexcept;
  void flush();
  [[nodiscard]] bool callerMayRead(TimePoint now) const noexcept;
  /// Sees to it that somebody reads, now that nobody does.
  void findReader() noexcept;
  void sleep(Lock& lock, Request& request, TimePoint until);
  [[nodiscard]] bool isOverdue(TimePoint now) const noexcept;

  /// A reply, the request that it answers, and that request taken out of the queue.
  struct Answer {
    frames::Reply reply;
    Request* request = nullptr;
    std::shared_ptr<Request> done;
  };

  // By the reader. `lock` is held on entry and exit, and not while waiting or decoding.
  void readUntilDone(Lock& lock, const Request& request, TimePoint until);
  /// Reads once, without the lock.
  Came readSome() noexcept;
  /// Without the lock: sleeps until there is something to read, it is time, or the process has
  /// ended with nothing to read: then true.
  [[nodiscard]] bool waitForReplies(TimePoint until) const noexcept;
  /// Gives out what came. Returns what the service did that no service does; empty when it has
  /// ended; nothing when all is well.
  std::optional<std::string> take(Lock& lock, Came came);
  /// Returns why the service is not to be used, if so.
  std::string greet(const Data& body);
  /// Gives out all replies that have come. Throws, without the lock, over one that is wrong, when
  /// those beside it have been given out.
  void settle(Lock& lock);
  /// Fills `answers_` with replies; what was wrong with the one behind them, if that is the end.
  std::exception_ptr collect() noexcept;
  /// Gives outcomes to their requests; what was wrong with one of them.
  std::exception_ptr resolve() noexcept;

  // By the connection's thread.
  void run() noexcept;
  void turn(Lock& lock);
  void chooseReader(TimePoint now) noexcept;
  /// How long it may sleep; settles whether that is attentive.
  int timeout(TimePoint now) noexcept;
  [[nodiscard]] int waitMilliseconds(TimePoint now) const noexcept;
  void start(Lock& lock);
  void startFailed(Lock& lock, const std::string& why, bool passing);
  /// Replaces the process. `what` as from `take`.
  void lose(Lock& lock, const std::string& what, ServiceError::Kind kind);
  void failAll(Lock& lock, std::string_view why) noexcept;
  /// For a request that was taken out of the queue.
  void giveUp(Request& request, std::exception_ptr error) noexcept;

  const std::string program_;
  const Clock::duration deadline_;
  ForkMark forkMark_;  // of the process that started the thread

  std::mutex mutex_;
  Admission admission_;
  RequestQueue queue_;
  State state_ = State::absent;
  Reader reader_ = Reader::nobody;
  std::vector<Request*> sleepers_;      // requests that somebody sleeps for
  std::condition_variable readerLeft_;  // for `failAll`
  std::optional<std::string> trouble_;  // what `take` returned, for the thread to act on
  TimePoint lastSubmit_{};              // by a caller who did not wait
  int socket_ = -1;                     // of a process that is ready
  bool unwritable_ = false;
  bool blocked_ = false;      // more was to be sent than could be
  bool stirred_ = false;      // a caller who did not wait has submitted since the thread last slept
  bool callersTurn_ = false;  // a caller has read since then, or is given the time to
  bool attentive_ = false;    // the thread looks for what is unsent or unread within a tick
  bool stopping_ = false;
  bool waiting_ = false;     // the thread is in poll
  bool watchesEnd_ = false;  // ... and will hear of the process's end
  FileDescriptor wake_;
  std::thread thread_;

  // The reader's own, and the thread's while there is no reader.
  std::optional<ServiceProcess> process_;
  std::optional<frames::FrameAssembler> assembler_;
  std::vector<Answer> answers_;
  frames::BriefWait callersWait_{kPatience};

  // The thread's own.
  TimePoint greetBy_{};
  TimePoint nextStart_{};
  TimePoint unreadSince_{};  // nobody has read what is in flight
  bool ended_ = false;       // the process has; what it said is to be read
  unsigned startFailures_ = 0;
};

}  // namespace ironmoat::client
