#include "client/request_queue.h"

#include <algorithm>
#include <utility>

#include "frames/frame.h"

namespace ironmoat::client {

RequestQueue::RequestQueue(Clock::duration deadline) : deadline_(deadline) {
  staged_.reserve(kMostAtOnce * (frames::kMaxRequestHead + kWorthCopying));
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
  staged_.truncate(0);
  char* const staged = staged_.bytes();  // stays where it is: there is room for the most
  std::size_t used = 0;
  std::size_t partsStart = 0;  // where the staged part under way starts
  const auto endPart = [&] {
    if (staged_.size() == partsStart) return;
    parts[used++] = {staged + partsStart, staged_.size() - partsStart};
    partsStart = staged_.size();
  };
  std::size_t room = std::min(kMostAtOnce, kWindow - owedCount_);
  // Two parts are enough for any: what is staged before it is in the same part as its head.
  for (std::uint64_t id = next_; id < sendableEnd() && room > 0 && parts.size() - used >= 2; ++id) {
    // There is a request: what has its outcome was sent before `next_`, or is among the suspects
    // and not their front.
    const Request& request = *slot(id).request;
    --room;
    const std::string_view message = request.message().view();
    frames::appendRequestHead(staged_, id, request.outputType(), message.size());
    if (message.size() <= kWorthCopying) {
      staged_.append(message);
    } else {
      endPart();
      parts[used++] = {const_cast<char*>(message.data()), message.size()};
    }
  }
  endPart();
  std::size_t skip = sentOfNext_;
  for (std::size_t i = 0; skip > 0; ++i) {
    const std::size_t skipped = std::min(skip, parts[i].iov_len);
    parts[i].iov_base = static_cast<char*>(parts[i].iov_base) + skipped;
    parts[i].iov_len -= skipped;
    skip -= skipped;
  }
  return used;
}

void RequestQueue::sent(std::size_t bytes) {
  while (bytes > 0) {
    const Request& request = *slot(next_).request;
    if (sentOfNext_ == 0) ++begun_;
    const std::size_t left =
        frames::requestHeadBytes(request.outputType()) + request.message().size() - sentOfNext_;
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
