#pragma once

#include <cstddef>
#include <cstring>
#include <string_view>

#include "plist/xml_chars.h"
#include "plist/xml_source.h"

namespace ironmoat::plist {

/// Compares a few bytes, whose number the compiler knows, by words that may overlap.
template <std::size_t Count>
bool sameBytes(const char* a, const char* b) noexcept {
  static_assert(Count >= 1 && Count <= 16);
  constexpr std::size_t kWord = Count >= 8 ? 8 : Count >= 4 ? 4 : Count >= 2 ? 2 : 1;
  constexpr std::size_t kLast = Count - kWord;
  return std::memcmp(a, b, kWord) == 0 &&
         (kLast == 0 || std::memcmp(a + kLast, b + kLast, kWord) == 0);
}

/// Moves over a source's text. Nothing moves past the end, and nothing is read there; what moves,
/// moves on for good, so that all of a reader's work is linear.
class XmlScanner {
 public:
  explicit XmlScanner(XmlSource& source) noexcept
      : source_(source),
        at_(source.text().data()),
        end_(source.text().data() + source.text().size()) {}

  [[nodiscard]] const char* at() const noexcept { return at_; }
  [[nodiscard]] bool atEnd() const noexcept { return at_ == end_; }
  /// The character here or a few further on, NUL past the end: no text holds one.
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
  /// A comment or processing instruction begins here.
  [[nodiscard]] bool looksAtMarkup() const noexcept { return looksAt("<?") || looksAt("<!--"); }
  /// Requires that many characters to be left.
  void advance(std::size_t count) noexcept { at_ += count; }

  /// Whether there was any.
  bool skipSpace() noexcept {
    const char* before = at_;
    while (at_ != end_ && isXmlSpace(*at_)) ++at_;
    return at_ != before;
  }
  /// Moves on to what may end a run of plain text (see findTextStop), or to the end.
  void skipPlainText() noexcept { at_ = findTextStop(at_, end_); }

  // From here on all may reject, and are false when they have (see XmlSource).

  /// The text up to `mark`, and moves past both.
  [[nodiscard]] bool takeUntil(std::string_view mark, std::string_view& text);
  /// The value of an attribute or literal in quotes of either kind.
  [[nodiscard]] bool takeQuoted(std::string_view& value);
  /// The value in ` = "..."`.
  [[nodiscard]] bool takeAttributeValue(std::string_view& value);
  [[nodiscard]] bool takeName(std::string_view& name);

  /// All that may stand before the root: declaration, DOCTYPE, white space and markup.
  [[nodiscard]] bool skipProlog();
  /// White space, comments and processing instructions.
  [[nodiscard]] bool skipMisc();
  /// Requires looksAtMarkup().
  [[nodiscard]] bool skipMarkup();

  /// Rejects the message as `malformed` for the place here, or for its "unexpected end" there.
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
