#include "host/request_loop.h"

#include <fcntl.h>
#include <sys/select.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>
#include <new>
#include <span>

#include "sandbox/memory.h"

namespace ironmoat::host {

namespace {

constexpr timespec kIdle = {1, 0};

/// Waits until the descriptor is ready, at most for `time` unless it is null; false if the time is
/// up or the wait failed. pselect, because poll rejects descriptors under an open-files limit of 0.
bool waitFor(int descriptor, bool toRead, const timespec* time) {
  int count = 0;
  do {
    fd_set only;
    FD_ZERO(&only);
    FD_SET(descriptor, &only);
    count = ::pselect(descriptor + 1, toRead ? &only : nullptr, toRead ? nullptr : &only, nullptr,
                      time, nullptr);
  } while (count < 0 && errno == EINTR);
  return count > 0;
}

}  // namespace

RequestLoop::RequestLoop(const IronmoatServer& server, int input, int output)
    : server_(server),
      input_(input),
      output_(output),
      assembler_(frames::kMaxRequestBody, Sharing::oneThread) {
  struct stat what = {};
  isSocket_ = ::fstat(input, &what) == 0 && S_ISSOCK(what.st_mode) &&
              ::fcntl(input, F_SETFL, O_NONBLOCK) == 0;
}

void RequestLoop::run(const frames::Hello& hello) {
  frames::appendHello(replies_, hello);
  try {
    while (flush() && receive()) {
      while (const std::optional<Data> request = take()) {
        answer(*request);
        if (replies_.size() >= kBatch && !flush()) return;
      }
    }
  } catch (const frames::FrameError& error) {
    frames::appendDescription(replies_, 0, frames::Status::notServed, error.what());
    flush();
  } catch (const std::bad_alloc&) {
    // No memory to read a request: end in order, so that the peer can start another service.
    flush();
  }
}

std::optional<Data> RequestLoop::take() {
  return withMemory([&] { return assembler_.next(); });
}

/// If memory runs out, tries once more with nothing else in memory, so that the outcome of a
/// request depends on its own bytes only.
void RequestLoop::answer(const Data& request) {
  try {
    return server_.answer(request, replies_);
  } catch (const std::bad_alloc&) {
    release();
  }
  server_.serve(request, replies_);
}

bool RequestLoop::receive() {
  const std::span<char> room = withMemory([&] { return assembler_.room(); });
  ssize_t count = -1;
  const auto look = [&] {
    count = ::read(input_, room.data(), room.size());
    return count >= 0 || (errno != EAGAIN && errno != EINTR);
  };
  bool done = isSocket_ && (look() || spin_(look));
  while (!done) {
    if (!waitFor(input_, true, &kIdle)) {
      rest();
      waitFor(input_, true, nullptr);
    }
    done = look();
  }
  if (count > 0) assembler_.commit(static_cast<std::size_t>(count));
  return count > 0;
}

void RequestLoop::rest() {
  static_cast<void>(replies_.finish());
  assembler_.wipeSpare();
  sandbox::wipeAndReleaseMemory();
}

void RequestLoop::release() {
  flush();
  static_cast<void>(replies_.finish());
  sandbox::releaseMemory();
}

bool RequestLoop::flush() {
  const char* next = replies_.bytes();
  std::size_t left = broken_ ? 0 : replies_.size();
  while (left > 0) {
    const iovec piece = {const_cast<char*>(next), left};  // the filter allows writev only
    const ssize_t count = ::writev(output_, &piece, 1);
    if (count >= 0) {
      next += count;
      left -= static_cast<std::size_t>(count);
    } else if (errno == EAGAIN) {
      waitFor(output_, false, nullptr);
    } else if (errno != EINTR) {
      broken_ = true;
      left = 0;
    }
  }
  replies_.truncate(0);
  if (replies_.capacity() > 2 * kBatch) static_cast<void>(replies_.finish());
  return !broken_;
}

}  // namespace ironmoat::host
