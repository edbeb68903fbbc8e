#include "frames/frame_assembler.h"

#include <algorithm>
#include <cstring>
#include <string_view>

#include "frames/frame.h"
#include "frames/little_endian.h"

namespace ironmoat::frames {

namespace {
constexpr std::size_t kBuffer = std::size_t{64} << 10;
constexpr std::size_t kWorthReading = std::size_t{16} << 10;

Data dataOf(const BlockRef& block) noexcept {
  return block ? Data(detail::Slice(block.get(), 0, block->size())) : Data();
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
  // Only the start of one frame is left, and it moves at most once: afterwards it starts at 0.
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
    return;
  }
  large_.extend(count);  // within what `room` reserved
  remaining_ -= count;
  largeDone_ = remaining_ == 0;
}

std::optional<Data> FrameAssembler::next() {
  if (largeDone_) return takeLarge();
  const std::size_t came = last_ - first_;
  if (came < kLengthBytes) return std::nullopt;  // always so while a large frame arrives
  const char* const frame = buffer_.get() + first_;
  const std::size_t length = load<std::uint32_t>(frame);
  if (length > maxBody_) throw FrameError("a frame announces more bytes than any may have");

  const std::string_view body(frame + kLengthBytes, std::min(came - kLengthBytes, length));
  if (body.size() == length) {
    Data whole(detail::Slice::copyOf(body, sharing_));
    first_ += kLengthBytes + length;
    if (first_ == last_) first_ = last_ = 0;
    return whole;
  }
  if (length > kBuffer - kLengthBytes) {
    // Twice what came, in the block where the rest will arrive.
    large_.reserve(std::min(length, std::max(kBuffer, 2 * body.size())));
    large_.append(body);
    remaining_ = length - body.size();
    first_ = last_ = 0;
  }
  return std::nullopt;
}

void FrameAssembler::wipeSpare() noexcept {
  std::memset(buffer_.get(), 0, first_);
  std::memset(buffer_.get() + last_, 0, kBuffer - last_);
}

Data FrameAssembler::takeLarge() {
  largeDone_ = false;
  return dataOf(large_.finish());
}

}  // namespace ironmoat::frames
