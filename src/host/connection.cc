#include "host/connection.h"

#include <poll.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "frames/frame.h"

namespace ironmoat::host {

namespace {

/// A call on a descriptor failed for now: waits until it is ready. False when it failed for good.
bool waitOut(int descriptor, short events) {
  if (errno == EINTR) return true;
  if (errno != EAGAIN && errno != EWOULDBLOCK) return false;
  pollfd wait{descriptor, events, 0};
  return poll(&wait, 1, -1) >= 0 || errno == EINTR;
}

}  // namespace

RequestSource::RequestSource(int descriptor)
    : descriptor_(descriptor), assembler_(frames::kMaxRequestBody, Sharing::oneThread) {}

std::optional<Data> RequestSource::next() {
  const std::lock_guard lock(mutex_);
  while (!ended_) {
    try {
      if (std::optional<Data> body = assembler_.next()) return body;
    } catch (...) {
      ended_ = true;
      throw;
    }
    const std::span<char> room = assembler_.room();
    const ssize_t count = read(descriptor_, room.data(), room.size());
    if (count > 0) {
      assembler_.commit(static_cast<std::size_t>(count));
    } else if (count == 0 || !waitOut(descriptor_, POLLIN)) {
      ended_ = true;
    }
  }
  return std::nullopt;
}

void RequestSource::close() {
  const std::lock_guard lock(mutex_);
  ended_ = true;
}

void ReplySink::send(BlockRef frame) {
  std::unique_lock lock(mutex_);
  written_.wait(lock, [&] { return waitingBytes_ < kMostWaiting || broken_; });
  if (broken_ || !frame) return;
  waitingBytes_ += frame->size();
  waiting_.push_back(std::move(frame));
  if (writing_) return;
  writing_ = true;
  std::vector<BlockRef> batch;
  while (!waiting_.empty()) {
    batch.swap(waiting_);
    waitingBytes_ = 0;
    lock.unlock();
    written_.notify_all();
    writeAll(batch);
    batch.clear();
    lock.lock();
  }
  writing_ = false;
}

void ReplySink::writeAll(const std::vector<BlockRef>& frames) {
  constexpr std::size_t kMostPieces = 64;
  std::size_t first = 0;
  std::size_t written = 0;  // bytes of frames[first] that are out
  while (first < frames.size() && !broken_) {
    iovec pieces[kMostPieces];
    const std::size_t count = std::min(kMostPieces, frames.size() - first);
    for (std::size_t i = 0; i < count; ++i) {
      const std::size_t skip = i == 0 ? written : 0;
      const Block& block = *frames[first + i].get();
      pieces[i] = {const_cast<char*>(block.bytes()) + skip, block.size() - skip};
    }
    const ssize_t result = writev(descriptor_, pieces, static_cast<int>(count));
    if (result < 0) {
      if (!waitOut(descriptor_, POLLOUT)) broken_ = true;
      continue;
    }
    written += static_cast<std::size_t>(result);
    while (first < frames.size() && written >= frames[first]->size()) {
      written -= frames[first]->size();
      ++first;
    }
  }
}

}  // namespace ironmoat::host
