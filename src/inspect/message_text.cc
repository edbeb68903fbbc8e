#include "inspect/message_text.h"

#include <algorithm>

#include "values/utf8.h"

namespace ironmoat::inspect {

MessageText::MessageText(const Data& message) : bytes_(message.view()) {
  bigEndian_ = bytes_.starts_with("\xFE\xFF");
  if (bigEndian_ || bytes_.starts_with("\xFF\xFE")) {
    unitSize_ = start_ = 2;
  } else if (bytes_.starts_with("\xEF\xBB\xBF")) {
    start_ = 3;
  }
}

/// Of UTF-16. Of the half unit that may stand at the end, a replacement.
char32_t MessageText::unit(std::size_t offset) const {
  if (bytes_.size() - offset < 2) return kReplacement;
  const auto byte = [&](std::size_t i) {
    return char32_t{static_cast<unsigned char>(bytes_[offset + i])};
  };
  return bigEndian_ ? byte(0) << 8U | byte(1) : byte(1) << 8U | byte(0);
}

CodePoint MessageText::at(std::size_t offset) const {
  if (unitSize_ == 1) return firstCodePoint(bytes_.substr(offset));
  const std::size_t left = bytes_.size() - offset;
  const char32_t first = unit(offset);
  if ((first & 0xF800U) != 0xD800) return {first, std::min<std::size_t>(left, 2), left >= 2};
  if (first < 0xDC00 && left >= 4 && (unit(offset + 2) & 0xFC00U) == 0xDC00) {
    return {0x10000 + ((first & 0x3FFU) << 10U) + (unit(offset + 2) & 0x3FFU), 4, true};
  }
  return {kReplacement, 2, false};
}

std::string_view MessageText::utf8(std::size_t offset, const CodePoint& point,
                                   std::string& buffer) const {
  if (unitSize_ == 1 || !point.wellFormed) return bytes_.substr(offset, point.length);
  buffer.resize(4);
  buffer.resize(writeUtf8(point.value, buffer.data()));
  return buffer;
}

TextPlace MessageText::placeOf(std::size_t offset) const {
  TextPlace place{1, 1};
  for (std::size_t next = std::min(start_, offset); next < offset;) {
    const CodePoint point = at(next);
    next += point.length;
    const bool firstHalf = point.value == '\r' && next < bytes_.size() && at(next).value == '\n';
    if (isLineEnd(point.value) && !firstHalf) {
      place = {place.line + 1, 1};
    } else {
      ++place.column;
    }
  }
  return place;
}

std::size_t MessageText::startNear(std::size_t offset, std::size_t most, bool& cut) const {
  const std::size_t first = std::min(start_, offset);
  std::size_t start = offset;
  // By units: the middle of a character shows as a broken one, which the cut leaves out.
  while (start - first >= unitSize_ && !isLineEnd(at(start - unitSize_).value)) {
    if (offset - start >= most * unitSize_) {
      cut = true;
      break;
    }
    start -= unitSize_;
  }
  while (cut && start < offset && !at(start).wellFormed) start += unitSize_;
  return start;
}

}  // namespace ironmoat::inspect
