#include "host/worker.h"

#include <mutex>
#include <new>
#include <shared_mutex>

#include "frames/frame.h"

namespace ironmoat::host {

namespace {
constexpr int kMostFailuresToRead = 8;
}

void Worker::run() {
  try {
    while (!sink_.broken()) {
      const std::optional<Data> request = next();
      if (!request) break;
      reply(*request);
    }
  } catch (const frames::FrameError& error) {
    frames::appendSentence(frame_, 0, frames::Status::notServed, error.what());
    sink_.add(frame_);
  } catch (const std::bad_alloc&) {
    // Not even room for an error: an end in order, and the peer may start another service.
  }
  flush();
  source_.close();
}

std::optional<Data> Worker::next() {
  for (int failures = 0;; ++failures) {
    try {
      return source_.next(beforeWaiting_);
    } catch (const std::bad_alloc&) {
      if (failures == kMostFailuresToRead) throw;
      const std::unique_lock othersAreDone(turns_);
      sink_.flush();
    }
  }
}

// Replies are added and written within a turn, for it is memory that counts.

void Worker::reply(const Data& request) {
  try {
    const std::shared_lock together(turns_);
    server_.answer(request, frame_);
    return sink_.add(frame_);
  } catch (const std::bad_alloc&) {
    static_cast<void>(frame_.finish());
  }
  replyAlone(request);
}

void Worker::replyAlone(const Data& request) {
  const std::unique_lock alone(turns_);
  sink_.flush();
  server_.serve(request, frame_);
  sink_.add(frame_);
}

void Worker::flush() {
  const std::shared_lock together(turns_);
  sink_.flush();
}

}  // namespace ironmoat::host
