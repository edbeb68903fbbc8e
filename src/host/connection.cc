#include "host/connection.h"

#include <sys/select.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <utility>

#include "frames/frame.h"

namespace ironmoat::host {

namespace {

enum class Readiness : std::uint8_t { toRead, toWrite };

/// A call on a descriptor failed for now: waits until it is ready. False when it failed for good.
/// By pselect, because poll takes no descriptors at all under an open-files limit of 0.
bool waitOut(int descriptor, Readiness readiness) {
  if (errno == EINTR) return true;
  if (errno != EAGAIN && errno != EWOULDBLOCK) return false;
  fd_set only;
  FD_ZERO(&only);
  FD_SET(descriptor, &only);
  fd_set* const toRead = readiness == Readiness::toRead ? &only : nullptr;
  fd_set* const toWrite = readiness == Readiness::toWrite ? &only : nullptr;
  return pselect(descriptor + 1, toRead, toWrite, nullptr, nullptr, nullptr) >= 0 || errno == EINTR;
}

}  // namespace

RequestSource::RequestSource(int descriptor)
    : descriptor_(descriptor), assembler_(frames::kMaxRequestBody, Sharing::oneThread) {}

std::optional<Data> RequestSource::next() {
  const std::lock_guard lock(mutex_);
  while (!ended_) {
    try {
      if (std::optional<Data> body = assembler_.next()) return body;
    } catch (const frames::FrameError&) {
      ended_ = true;
      throw;
    }
    const std::span<char> room = assembler_.room();
    const ssize_t count = read(descriptor_, room.data(), room.size());
    if (count > 0) {
      assembler_.commit(static_cast<std::size_t>(count));
    } else if (count == 0 || !waitOut(descriptor_, Readiness::toRead)) {
      ended_ = true;
    }
  }
  return std::nullopt;
}

void RequestSource::close() {
  const std::lock_guard lock(mutex_);
  ended_ = true;
}

ReplySink::ReplySink(int descriptor) : descriptor_(descriptor) {
  waiting_.reserve(kMostFrames);
  batch_.reserve(kMostFrames);
}

void ReplySink::send(BlockRef frame) {
  std::unique_lock lock(mutex_);
  written_.wait(lock, [&] {
    return (waitingBytes_ < kMostWaiting && waiting_.size() < kMostFrames) || broken_;
  });
  if (broken_ || !frame) return;
  waitingBytes_ += frame->size();
  waiting_.push_back(std::move(frame));
  if (writing_) return;
  writing_ = true;
  while (!waiting_.empty()) {
    batch_.swap(waiting_);
    waitingBytes_ = 0;
    lock.unlock();
    written_.notify_all();
    writeAll(batch_);
    batch_.clear();
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
      if (!waitOut(descriptor_, Readiness::toWrite)) broken_ = true;
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
