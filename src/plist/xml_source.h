#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>
#include <utility>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"

namespace ironmoat::plist {

/// A message as XML text: known to be UTF-8 and to hold only XML characters. A message in UTF-16 is
/// transcoded into a block of its own; any other is its own text.
///
/// Nothing is thrown for a bad message. Where the reader rejects it, it says `return reject(...)`,
/// which keeps the one error here and is false; every function on the way back returns false at
/// once, so that nothing goes on with what was not proven.
class XmlSource {
 public:
  enum class Characters { unknown, known };

  /// Keeps a reference to `message`, and has no text until it is opened.
  explicit XmlSource(const Data& message) noexcept : message_(message) {}

  /// Rejects bytes that are no such text; `known` ones have been such a source before, which is not
  /// checked again.
  [[nodiscard]] bool open(Characters characters = Characters::unknown);

  /// The message is UTF-16; its text here is UTF-8 all the same.
  [[nodiscard]] bool isUtf16() const noexcept { return utf16_; }
  /// Without the byte-order mark.
  [[nodiscard]] std::string_view text() const noexcept { return text_; }
  /// Where the text lies; none when the message is empty.
  [[nodiscard]] const BlockRef& block() const noexcept { return block_; }
  [[nodiscard]] std::uint32_t offsetInBlock(const char* at) const noexcept {
    return static_cast<std::uint32_t>(at - block_->bytes());
  }
  [[nodiscard]] Sharing sharing() const noexcept {
    return block_ ? block_->sharing() : Sharing::anyThread;
  }

  /// Rejects the message when it is not in the encoding that its declaration names; `at` is where.
  [[nodiscard]] bool checkEncoding(std::string_view name, const char* at);

  /// The place `at` of the text, as an offset into the message.
  [[nodiscard]] std::uint64_t offsetInMessage(const char* at) const noexcept;
  /// Rejects the message as `malformed` for that place.
  [[nodiscard, gnu::cold, gnu::noinline]] bool reject(const char* reason, const char* at);
  [[nodiscard, gnu::cold, gnu::noinline]] bool reject(DecodingError error);
  /// Requires that the message was rejected.
  [[nodiscard]] DecodingError takeRejection() { return std::move(rejection_).value(); }

 private:
  [[nodiscard]] bool transcodeUtf16(bool bigEndian);
  [[nodiscard]] std::uint32_t utf16Unit(std::size_t index) const noexcept;

  const Data& message_;
  BlockRef block_;
  std::string_view text_;
  bool utf16_ = false;
  bool bigEndian_ = false;
  std::optional<DecodingError> rejection_;
};

}  // namespace ironmoat::plist
