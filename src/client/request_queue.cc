#include "client/request_queue.h"

#include <algorithm>
#include <utility>

#include "frames/frame.h"
#include "ironmoat/limits.h"

namespace ironmoat::client {

RequestQueue::RequestQueue(Clock::duration deadline) : deadline_(deadline) {
  heads_.reserve(kMostAtOnce *
                 (frames::kLengthBytes + frames::kMaxRequestBody - limits::messageBytes));
}

std::uint64_t RequestQueue::push(std::shared_ptr<Request> request, TimePoint now) {
  slots_.push_back({std::move(request), {}});
  if (ready_ && slots_.size() == 1) runClocks(front_ + 1, now);
  return end() - 1;
}

void RequestQueue::restart(TimePoint now) {
  ready_ = true;
  if (!empty()) runClocks(front_ + 1, now);
}

std::uint64_t RequestQueue::sendableEnd() const noexcept {
  // A suspect has the process to itself.
  return front_ < suspectsEnd_ ? std::min(front_ + 1, end()) : end();
}

bool RequestQueue::hasUnsent() const noexcept {
  return ready_ && next_ < sendableEnd() && owedCount_ < kWindow;
}

std::size_t RequestQueue::gather(std::span<iovec> parts) {
  if (!hasUnsent()) return 0;
  heads_.truncate(0);
  std::size_t used = 0;
  std::size_t skip = sentOfNext_;
  std::size_t room = std::min(kMostAtOnce, kWindow - owedCount_);
  for (std::uint64_t id = next_; id < sendableEnd() && room > 0 && parts.size() - used >= 2; ++id) {
    // There is a request: what has its outcome was sent before `next_`, or is among the suspects
    // and not their front.
    const Request& request = *slot(id).request;
    --room;
    const std::string_view message = request.message().view();
    const std::size_t start = heads_.size();
    frames::appendRequestHead(heads_, id, request.outputType(), message.size());
    // Heads are placed below, once they have stopped moving.
    parts[used++] = {nullptr, heads_.size() - start};
    parts[used++] = {const_cast<char*>(message.data()), message.size()};
  }
  char* head = heads_.bytes();
  for (std::size_t i = 0; i < used; ++i) {
    iovec& part = parts[i];
    if (i % 2 == 0) {
      part.iov_base = head;
      head += part.iov_len;
    }
    const std::size_t skipped = std::min(skip, part.iov_len);
    part.iov_base = static_cast<char*>(part.iov_base) + skipped;
    part.iov_len -= skipped;
    skip -= skipped;
  }
  return used;
}

void RequestQueue::sent(std::size_t bytes) {
  while (bytes > 0) {
    const Request& request = *slot(next_).request;
    if (sentOfNext_ == 0) ++begun_;
    heads_.truncate(0);
    frames::appendRequestHead(heads_, next_, request.outputType(), request.message().size());
    const std::size_t left = heads_.size() + request.message().size() - sentOfNext_;
    if (bytes < left) {
      sentOfNext_ += bytes;
      break;
    }
    bytes -= left;
    sentOfNext_ = 0;
    ++next_;
    ++owedCount_;
  }
}

Request* RequestQueue::owed(std::uint64_t id) noexcept {
  return id >= front_ && id < next_ ? slot(id).request.get() : nullptr;
}

std::shared_ptr<Request> RequestQueue::finish(std::uint64_t id, TimePoint now) {
  std::shared_ptr<Request> request = std::move(slot(id).request);
  --owedCount_;
  runClocks(id, now);
  dropFinished();
  if (!empty()) runClocks(front_ + 1, now);
  return request;
}

void RequestQueue::dropFinished() noexcept {
  while (!slots_.empty() && slots_.front().request == nullptr) {
    slots_.pop_front();
    ++front_;
  }
  next_ = std::max(next_, front_);
  clocked_ = std::max(clocked_, front_);
}

void RequestQueue::runClocks(std::uint64_t before, TimePoint now) noexcept {
  for (; clocked_ < before; ++clocked_) slot(clocked_).clock = now;
}

std::optional<RequestQueue::TimePoint> RequestQueue::expiry() const noexcept {
  if (!ready_ || clocked_ == front_) return std::nullopt;
  return slots_.front().clock + deadline_;
}

std::shared_ptr<Request> RequestQueue::lose() noexcept {
  const std::uint64_t begunEnd = next_ + (sentOfNext_ > 0 ? 1 : 0);
  std::shared_ptr<Request> culprit;
  if (begun_ == 1 && begunEnd > front_) {
    // The one that was begun is the front: whatever stood before it has had its outcome.
    culprit = std::move(slots_.front().request);
    dropFinished();
  } else if (begunEnd > front_) {
    suspectsEnd_ = std::max(suspectsEnd_, begunEnd);
  }
  next_ = clocked_ = front_;
  sentOfNext_ = owedCount_ = 0;
  begun_ = 0;
  ready_ = false;
  return culprit;
}

std::shared_ptr<Request> RequestQueue::takeFront() noexcept {
  std::shared_ptr<Request> request = std::move(slots_.front().request);
  dropFinished();
  return request;
}

}  // namespace ironmoat::client
