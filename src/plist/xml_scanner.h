#pragma once

#include <cstddef>
#include <cstring>
#include <string_view>

#include "plist/xml_chars.h"
#include "plist/xml_source.h"

namespace ironmoat::plist {

/// Compares `Count` bytes by at most two words, which may overlap.
template <std::size_t Count>
bool sameBytes(const char* a, const char* b) noexcept {
  static_assert(Count >= 1 && Count <= 16);
  constexpr std::size_t kWord = Count >= 8 ? 8 : Count >= 4 ? 4 : Count >= 2 ? 2 : 1;
  constexpr std::size_t kLast = Count - kWord;
  return std::memcmp(a, b, kWord) == 0 &&
         (kLast == 0 || std::memcmp(a + kLast, b + kLast, kWord) == 0);
}

/// A cursor over a source's text. Never moves past the end, reads there, or moves back, so that
/// reading takes linear time.
class XmlScanner {
 public:
  explicit XmlScanner(XmlSource& source) noexcept
      : source_(source),
        at_(source.text().data()),
        end_(source.text().data() + source.text().size()) {}

  [[nodiscard]] const char* at() const noexcept { return at_; }
  [[nodiscard]] bool atEnd() const noexcept { return at_ == end_; }
  /// The character `ahead` of the cursor, or NUL past the end. No text contains NUL.
  [[nodiscard]] char peek(std::ptrdiff_t ahead = 0) const noexcept {
    return end_ - at_ > ahead ? at_[ahead] : '\0';
  }
  [[nodiscard]] std::string_view rest() const noexcept {
    return {at_, static_cast<std::size_t>(end_ - at_)};
  }

  template <std::size_t Size>
  [[nodiscard]] bool looksAt(const char (&literal)[Size]) const noexcept {
    return static_cast<std::size_t>(end_ - at_) >= Size - 1 && sameBytes<Size - 1>(at_, literal);
  }
  template <std::size_t Size>
  bool take(const char (&literal)[Size]) noexcept {
    if (!looksAt(literal)) return false;
    at_ += Size - 1;
    return true;
  }
  /// Whether a comment or processing instruction begins here.
  [[nodiscard]] bool looksAtMarkup() const noexcept { return looksAt("<?") || looksAt("<!--"); }
  /// Requires at least `count` characters before the end.
  void advance(std::size_t count) noexcept { at_ += count; }

  /// Returns whether there was any.
  bool skipSpace() noexcept {
    const char* before = at_;
    while (at_ != end_ && isXmlSpace(*at_)) ++at_;
    return at_ != before;
  }
  /// Moves to the next text stop (see findTextStop) or to the end.
  void skipPlainText() noexcept { at_ = findTextStop(at_, end_); }

  // The functions below return false when they reject the message (see XmlSource).

  /// Takes the text up to `mark` and moves past the mark.
  [[nodiscard]] bool takeUntil(std::string_view mark, std::string_view& text);
  /// Takes a value in single or double quotes.
  [[nodiscard]] bool takeQuoted(std::string_view& value);
  /// Takes the equals sign and the quoted value of an attribute.
  [[nodiscard]] bool takeAttributeValue(std::string_view& value);
  [[nodiscard]] bool takeName(std::string_view& name);

  /// Skips everything allowed before the root: declaration, DOCTYPE, white space and markup.
  [[nodiscard]] bool skipProlog();
  /// Skips white space, comments and processing instructions.
  [[nodiscard]] bool skipMisc();
  /// Requires looksAtMarkup().
  [[nodiscard]] bool skipMarkup();

  /// Rejects the message as `malformed` at the cursor or at `at`. At the end of the text the reason
  /// is an unexpected end instead.
  [[nodiscard]] bool reject(const char* reason) { return reject(reason, at_); }
  [[nodiscard]] bool reject(const char* reason, const char* at) {
    return source_.reject(at == end_ ? "unexpected end of message" : reason, at);
  }

 private:
  [[nodiscard]] bool declaration();
  [[nodiscard]] bool doctype();
  [[nodiscard]] bool publicIdentifier();
  [[nodiscard]] bool requireSpace();

  XmlSource& source_;
  const char* at_;
  const char* end_;
};

}  // namespace ironmoat::plist
