#include "plist/xml_source.h"

#include <algorithm>

#include "plist/rejection.h"
#include "plist/xml_chars.h"
#include "values/block_builder.h"
#include "values/utf8.h"

namespace ironmoat::plist {

namespace {

constexpr std::string_view kUtf8Mark = "\xEF\xBB\xBF";
constexpr std::size_t kUtf16MarkSize = 2;

BlockRef shared(Block* block) noexcept {
  if (block != nullptr) block->retain();
  return BlockRef::adopt(block);
}

bool isHighSurrogate(std::uint32_t unit) noexcept { return (unit & 0xFC00) == 0xD800; }
bool isLowSurrogate(std::uint32_t unit) noexcept { return (unit & 0xFC00) == 0xDC00; }

/// `word` must be in upper case.
bool equalsIgnoringCase(std::string_view text, std::string_view word) noexcept {
  return std::equal(text.begin(), text.end(), word.begin(), word.end(), [](char c, char upper) {
    return (c >= 'a' && c <= 'z' ? static_cast<char>(c - ('a' - 'A')) : c) == upper;
  });
}

}  // namespace

bool XmlSource::open(Characters characters) {
  block_ = shared(message_.slice().block());
  const std::string_view bytes = message_.view();
  if (bytes.starts_with("\xFE\xFF") || bytes.starts_with("\xFF\xFE")) {
    utf16_ = true;
    if (!transcodeUtf16(bytes.starts_with("\xFE\xFF"))) return false;
  } else {
    text_ = bytes.starts_with(kUtf8Mark) ? bytes.substr(kUtf8Mark.size()) : bytes;
  }
  if (characters == Characters::known) return true;
  const std::size_t valid = xmlTextPrefix(text_);
  return valid == text_.size() || reject("not a valid XML character", text_.data() + valid);
}

std::uint32_t XmlSource::utf16Unit(std::size_t index) const noexcept {
  const auto byte = [&](std::size_t i) {
    return std::uint32_t{message_.bytes()[kUtf16MarkSize + 2 * index + i]};
  };
  return bigEndian_ ? (byte(0) << 8) | byte(1) : byte(0) | (byte(1) << 8);
}

bool XmlSource::transcodeUtf16(bool bigEndian) {
  bigEndian_ = bigEndian;
  const std::size_t units = (message_.size() - kUtf16MarkSize) / 2;
  if (message_.size() % 2 != 0)
    return reject(malformed("missing second byte of a UTF-16 character", message_.size() - 1));
  BlockBuilder utf8(sharing());
  for (std::size_t at = 0; at < units;) {
    // In pieces, so that memory for the worst case is never reserved for the whole message.
    const std::size_t pieceEnd = std::min(units, at + 1024);
    const std::size_t before = utf8.size();
    char* const start = utf8.extend(3 * (pieceEnd - at) + 1);  // a pair may reach one unit past
    char* out = start;
    while (at < pieceEnd) {
      char32_t c = utf16Unit(at);
      if (c < 0x80) {
        *out++ = static_cast<char>(c);
        ++at;
        continue;
      }
      const std::size_t first = at++;
      if (isHighSurrogate(c) && at < units && isLowSurrogate(utf16Unit(at))) {
        c = 0x10000 + ((c & 0x3FF) << 10) + (utf16Unit(at++) & 0x3FF);
      } else if (isHighSurrogate(c) || isLowSurrogate(c)) {
        return reject(malformed("not a valid surrogate pair", kUtf16MarkSize + 2 * first));
      }
      out += writeUtf8(c, out);
    }
    utf8.truncate(before + static_cast<std::size_t>(out - start));
  }
  block_ = utf8.finish();
  if (block_) text_ = {block_->bytes(), block_->size()};
  return true;
}

bool XmlSource::checkEncoding(std::string_view name, const char* at) {
  const bool utf16 = equalsIgnoringCase(name, "UTF-16");
  const bool ascii = equalsIgnoringCase(name, "US-ASCII");
  if (!utf16 && !ascii && !equalsIgnoringCase(name, "UTF-8"))
    return reject("not a valid encoding name", at);
  if (utf16 != utf16_) {
    return reject(utf16_ ? "encoding not allowed: the message is in UTF-16"
                         : "encoding not allowed: the message is not in UTF-16",
                  at);
  }
  const std::size_t plain = ascii ? asciiPrefix(message_.view()) : message_.size();
  return plain == message_.size() || reject(malformed("not a valid US-ASCII character", plain));
}

std::uint64_t XmlSource::offsetInMessage(const char* at) const noexcept {
  const auto wanted = static_cast<std::size_t>(at - text_.data());
  if (!utf16_) return message_.size() - text_.size() + wanted;
  std::size_t unit = 0;
  for (std::size_t passed = 0; passed < wanted; ++unit) {
    const std::uint32_t c = utf16Unit(unit);
    // Each surrogate accounts for two of the four bytes of its character.
    const bool half = isHighSurrogate(c) || isLowSurrogate(c);
    passed += c < 0x80 ? 1 : c < 0x800 || half ? 2 : 3;
  }
  return kUtf16MarkSize + 2 * unit;
}

bool XmlSource::reject(const char* reason, const char* at) {
  return reject(malformed(reason, offsetInMessage(at)));
}

bool XmlSource::reject(DecodingError error) {
  rejection_.emplace(std::move(error));
  return false;
}

}  // namespace ironmoat::plist
