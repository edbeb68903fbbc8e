#pragma once

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
#include "frames/frame_assembler.h"
#include "ironmoat/client.h"

namespace ironmoat::client {

/// Brings requests to a service process and their outcomes back, and keeps that process running.
///
/// A thread of its own, started with the first request, starts, watches and replaces the process.
/// Bytes are sent under the mutex, by that thread or by a submitting one, or together with others'
/// by the reader, when it is about to look. They are read by one reader at a time: a thread that
/// waits for its own reply if it can be, since that saves waking another one for each, and the
/// connection's thread otherwise. Nobody waits in anything but poll, and the socket never blocks,
/// so that neither direction can hold up the other.
class Connection {
 public:
  explicit Connection(Client::Options options);
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;
  ~Connection();

  enum class Then : std::uint8_t { returns, waits };
  /// Waits while too many bytes are in flight. Every outcome goes to the request. `waits` says that
  /// the caller is going to wait for this one's: it may then have its outcome on return.
  void submit(std::unique_ptr<Request> request, Then then);

  /// This process is a copy of the one that uses the connection: nothing here may be touched, not
  /// even the mutex.
  [[nodiscard]] bool inForkedChild() const noexcept { return forkMark_.inCopy(); }

 private:
  using Clock = RequestQueue::Clock;
  using TimePoint = RequestQueue::TimePoint;
  using Lock = std::unique_lock<std::mutex>;
  enum class State : std::uint8_t { absent, greeting, ready };
  enum class Reader : std::uint8_t { nobody, caller, thread };

  // By any thread, under the mutex.
  void startThread();
  void wake() noexcept;
  void flush();

  /// A reply, the request that it answers, and that request taken out of the queue.
  struct Answer {
    frames::Reply reply;
    Request* request = nullptr;
    std::unique_ptr<Request> done;
  };

  // By the reader. `lock` is held on entry and exit, and not while waiting or decoding.
  void readUntilAnswered(Lock& lock, std::uint64_t id);
  /// How long the reader's poll may sleep; settles whether that is attentive.
  int readerTimeout(TimePoint now) noexcept;
  [[nodiscard]] int waitMilliseconds(TimePoint now) const noexcept;
  /// Reads once and gives out what came. Returns what the service did that no service does; empty
  /// when it has ended; nothing when all is well.
  std::optional<std::string> receive(Lock& lock);
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
  void start(Lock& lock);
  void startFailed(Lock& lock, const std::string& why, bool passing);
  /// Replaces the process. `what` as from `receive`.
  void lose(Lock& lock, const std::string& what, ServiceError::Kind kind);
  void failAll(Lock& lock, std::string_view why) noexcept;

  const std::string program_;
  const Clock::duration deadline_;
  ForkMark forkMark_;  // of the process that started the thread

  std::mutex mutex_;
  Admission admission_;
  RequestQueue queue_;
  State state_ = State::absent;
  Reader reader_ = Reader::nobody;
  std::optional<std::string> trouble_;  // what `receive` returned, for the thread to act on
  TimePoint lastSubmit_{};              // by a caller who did not wait
  int socket_ = -1;                     // of a process that is ready
  bool unwritable_ = false;
  bool blocked_ = false;    // more was to be sent than could be
  bool stirred_ = false;    // something has come since the reader last waited
  bool attentive_ = false;  // the reader looks for what is unsent within a millisecond
  bool stopping_ = false;
  bool waiting_ = false;     // the thread is in poll
  bool watchesEnd_ = false;  // ... and will hear of the process's end
  FileDescriptor wake_;
  std::thread thread_;

  // The reader's own, and the thread's while there is no reader.
  std::optional<ServiceProcess> process_;
  std::optional<frames::FrameAssembler> assembler_;
  std::vector<Answer> answers_;

  // The thread's own.
  TimePoint greetBy_{};
  TimePoint nextStart_{};
  unsigned startFailures_ = 0;
};

}  // namespace ironmoat::client
