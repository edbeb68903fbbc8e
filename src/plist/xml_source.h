#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>
#include <utility>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"

namespace ironmoat::plist {

/// A message as XML text, checked to be valid UTF-8 and to have only XML characters. A message in
/// UTF-16 is transcoded into a separate block; otherwise the text is a view of the message.
///
/// Invalid messages cause no exceptions. A function that rejects the message calls `reject`, which
/// stores the error here, and returns false; each of its callers must then return false at once.
class XmlSource {
 public:
  enum class Characters { unknown, known };

  /// `message` must outlive the source. There is no text before `open`.
  explicit XmlSource(const Data& message) noexcept : message_(message) {}

  /// Rejects bytes that are not valid XML text. `known` bytes were accepted before; their
  /// characters are not checked again.
  [[nodiscard]] bool open(Characters characters = Characters::unknown);

  /// Whether the message is in UTF-16; `text` is UTF-8 in any case.
  [[nodiscard]] bool isUtf16() const noexcept { return utf16_; }
  /// The text without a byte-order mark.
  [[nodiscard]] std::string_view text() const noexcept { return text_; }
  /// The block that holds the text; null if the message is empty.
  [[nodiscard]] const BlockRef& block() const noexcept { return block_; }
  [[nodiscard]] std::uint32_t offsetInBlock(const char* at) const noexcept {
    return static_cast<std::uint32_t>(at - block_->bytes());
  }
  [[nodiscard]] Sharing sharing() const noexcept {
    return block_ ? block_->sharing() : Sharing::anyThread;
  }

  /// Rejects the message if it is not in the encoding `name`, which its declaration has at `at`.
  [[nodiscard]] bool checkEncoding(std::string_view name, const char* at);

  /// The offset in the message of `at`, a position in the text.
  [[nodiscard]] std::uint64_t offsetInMessage(const char* at) const noexcept;
  /// Rejects the message as `malformed` at this position of the text.
  [[nodiscard, gnu::cold, gnu::noinline]] bool reject(const char* reason, const char* at);
  [[nodiscard, gnu::cold, gnu::noinline]] bool reject(DecodingError error);
  /// Requires a rejected message.
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
