#include "frames/frame_assembler.h"

#include <algorithm>
#include <cstring>
#include <string>
#include <string_view>

#include "frames/frame.h"
#include "frames/little_endian.h"

namespace ironmoat::frames {

namespace {
constexpr std::size_t kBuffer = std::size_t{64} << 10;
constexpr std::size_t kWorthReading = std::size_t{16} << 10;

[[noreturn, gnu::cold, gnu::noinline]] void rejectLength(std::size_t length, std::size_t limit) {
  throw FrameError("frame exceeds the limit of " + std::to_string(limit) + " bytes: found " +
                   std::to_string(length));
}

}  // namespace

FrameAssembler::FrameAssembler(std::size_t maxBody, Sharing sharing)
    : maxBody_(maxBody),
      sharing_(sharing),
      buffer_(std::make_unique_for_overwrite<char[]>(kBuffer)),
      large_(sharing) {}

std::span<char> FrameAssembler::room() {
  if (remaining_ != 0) {
    if (large_.size() == large_.capacity()) large_.reserve(std::min(remaining_, large_.size()));
    return {large_.bytes() + large_.size(),
            std::min(remaining_, large_.capacity() - large_.size())};
  }
  // The buffer holds the start of one frame only. It moves at most once: then it starts at 0.
  if (first_ != 0 && kBuffer - last_ < kWorthReading) {
    std::memmove(buffer_.get(), buffer_.get() + first_, last_ - first_);
    last_ -= first_;
    first_ = 0;
  }
  return {buffer_.get() + last_, kBuffer - last_};
}

void FrameAssembler::commit(std::size_t count) {
  if (remaining_ == 0) {
    last_ += count;
  } else {
    large_.extend(count);  // within what `room` reserved
    remaining_ -= count;
  }
}

std::optional<Data> FrameAssembler::next() {
  if (large_.size() != 0 && remaining_ == 0) return takeLarge();
  const std::size_t received = last_ - first_;
  if (received < kLengthBytes) return std::nullopt;  // as always while a large frame is incomplete
  const char* const frame = buffer_.get() + first_;
  const std::size_t length = load<std::uint32_t>(frame);
  if (length > maxBody_) rejectLength(length, maxBody_);

  const std::string_view body(frame + kLengthBytes, std::min(received - kLengthBytes, length));
  if (body.size() == length) {
    Data whole(detail::Slice::copyOf(body, sharing_));
    first_ += kLengthBytes + length;
    if (first_ == last_) first_ = last_ = 0;
    return whole;
  }
  if (length > kBuffer - kLengthBytes) {
    // Twice what is received, in the block that will receive the rest.
    large_.reserve(std::min(length, std::max(kBuffer, 2 * body.size())));
    large_.append(body);
    remaining_ = length - body.size();
    first_ = last_ = 0;
  }
  return std::nullopt;
}

Data FrameAssembler::takeLarge() {
  const BlockRef body = large_.finish();
  return Data(detail::Slice(body.get(), 0, body->size()));
}

void FrameAssembler::wipeSpare() noexcept {
  std::memset(buffer_.get(), 0, first_);
  std::memset(buffer_.get() + last_, 0, kBuffer - last_);
}

}  // namespace ironmoat::frames
