#pragma once

#include <bit>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "ironmoat/api.h"
#include "ironmoat/block.h"
#include "ironmoat/optional.h"
#include "ironmoat/record_memory.h"

namespace ironmoat {

/// Signed 64-bit integers. Two C++ types, so that a field declared as one is never wired to a field
/// declared as the other.
using Int = long;         // NOLINT(google-runtime-int)
using Int64 = long long;  // NOLINT(google-runtime-int)
using Bool = bool;
static_assert(sizeof(Int) == 8 && sizeof(Int64) == 8);

template <class T>
using List = std::vector<T, detail::ListAllocator<T>>;

namespace detail {

/// A range of a Block that keeps the block alive. Absent is all zero, and nothing else has neither
/// offset nor length; an empty range holds no block and is told from absence by its offset. What
/// was moved from holds no block either: it is absent, or still empty.
class Slice {
 public:
  Slice() noexcept = default;
  /// Requires offset + length <= block->size(). Takes a reference of its own.
  Slice(Block* block, std::uint32_t offset, std::uint32_t length) noexcept {
    if (length == 0) return;
    block->retain();
    range_ = {block, {offset, length}};
  }
  Slice(const Slice& other) noexcept : range_(other.range_) {
    if (range_.block != nullptr) range_.block->retain();
  }
  constexpr Slice(Slice&& other) noexcept : range_(other.range_) {
    if (range_.block != nullptr) other.range_ = kAbsent;
  }
  Slice& operator=(Slice other) noexcept {
    std::swap(range_, other.range_);
    return *this;
  }
  constexpr ~Slice() {
    if (range_.block != nullptr) range_.block->release();
  }

  static constexpr Slice absent() noexcept {
    Slice slice;
    slice.range_ = kAbsent;
    return slice;
  }
  [[nodiscard]] bool isAbsent() const noexcept {
    return std::bit_cast<std::uint64_t>(range_.extent) == 0;  // in one comparison
  }

  [[nodiscard]] const char* begin() const noexcept {
    return range_.block == nullptr ? "" : range_.block->bytes() + range_.extent.offset;
  }
  [[nodiscard]] std::uint32_t length() const noexcept { return range_.extent.length; }
  [[nodiscard]] std::string_view view() const noexcept { return {begin(), length()}; }
  [[nodiscard]] Block* block() const noexcept { return range_.block; }
  [[nodiscard]] std::uint32_t offset() const noexcept { return range_.extent.offset; }

  /// The same bytes in a block of their own.
  IRONMOAT_API static Slice copyOf(std::string_view bytes, Sharing sharing = Sharing::anyThread);

 private:
  struct Extent {
    std::uint32_t offset;
    std::uint32_t length;
  };
  struct Range {
    Block* block;
    Extent extent;
  };
  static constexpr Range kAbsent = {nullptr, {0, 0}};
  static constexpr Range kEmpty = {nullptr, {1, 0}};

  Range range_ = kEmpty;
};

template <class T>
concept Byte =
    std::same_as<T, char> || std::same_as<T, unsigned char> || std::same_as<T, std::byte>;

template <class R>
concept ByteRange = requires(const R& bytes) {
  { bytes.size() } -> std::convertible_to<std::size_t>;
  requires Byte<std::remove_cvref_t<decltype(*bytes.data())>>;
};

/// The text of a literal; nothing else is known when compiling.
struct Literal {
  template <std::size_t N>
  consteval Literal(const char (&literal)[N])  // NOLINT(google-explicit-constructor)
      : text(literal, N - 1) {
    if (literal[N - 1] != '\0') throw "not a literal";
  }
  std::string_view text;
};

}  // namespace detail

/// Immutable Unicode text, always valid UTF-8, at most 4 GiB - 1 bytes. Copying is O(1).
///
/// A String taken from a record is a slice of that record's whole message: keeping one keeps the
/// message's memory. `detached()` gives a copy that keeps nothing else. Copies may be used from
/// several threads at once. One that was moved from is empty. Print and compare by `view()`.
class String {
 public:
  String() noexcept = default;
  /// Copies the text. Throws std::invalid_argument when it is not valid UTF-8.
  IRONMOAT_API String(std::string_view text);  // NOLINT(google-explicit-constructor)
  /// Copies a literal.
  template <std::size_t N>
  String(const char (&literal)[N])  // NOLINT(google-explicit-constructor)
      : String(std::string_view(literal, N - (literal[N - 1] == '\0' ? 1 : 0))) {}
  /// Where a buffer's text ends, std::string_view(buffer) or (buffer, length) has to say.
  template <std::size_t N>
  String(char (&buffer)[N]) = delete;
  template <std::convertible_to<const char*> T>
  String(T text) = delete;
  /// Internal: the caller has checked that the slice is valid UTF-8.
  constexpr explicit String(detail::Slice validText) noexcept : slice_(std::move(validText)) {}

  [[nodiscard]] std::string_view view() const noexcept { return slice_.view(); }
  // NOLINTNEXTLINE(google-explicit-constructor)
  operator std::string_view() const noexcept { return view(); }
  /// Bytes of UTF-8, not characters.
  [[nodiscard]] std::size_t size() const noexcept { return slice_.length(); }
  [[nodiscard]] bool empty() const noexcept { return size() == 0; }
  [[nodiscard]] String detached() const { return String(detail::Slice::copyOf(view())); }

  friend bool operator==(const String& a, const String& b) noexcept { return a.view() == b.view(); }

 private:
  friend struct detail::Niche<String>;
  detail::Slice slice_;
};

/// Immutable bytes, at most 4 GiB - 1. Copying is O(1); lifetime and threads as for String.
class Data {
 public:
  Data() noexcept = default;
  /// Copies the bytes: of a std::string, std::string_view, std::vector, std::span or the like.
  template <detail::ByteRange R>
  explicit Data(const R& bytes) : Data(bytes.data(), bytes.size()) {}
  template <detail::Byte T>
  Data(const T* bytes, std::size_t size)
      : slice_(detail::Slice::copyOf({reinterpret_cast<const char*>(bytes), size})) {}
  /// Copies a literal, without its closing zero byte. Any other `const char*` or array of char does
  /// not compile: how many bytes of it are meant, only a size can tell.
  explicit Data(detail::Literal literal) : Data(literal.text) {}
  /// Internal.
  constexpr explicit Data(detail::Slice slice) noexcept : slice_(std::move(slice)) {}

  [[nodiscard]] std::span<const std::uint8_t> bytes() const noexcept {
    return {reinterpret_cast<const std::uint8_t*>(slice_.begin()), slice_.length()};
  }
  [[nodiscard]] std::string_view view() const noexcept { return slice_.view(); }
  [[nodiscard]] std::size_t size() const noexcept { return slice_.length(); }
  [[nodiscard]] bool empty() const noexcept { return size() == 0; }
  [[nodiscard]] Data detached() const { return Data(detail::Slice::copyOf(view())); }
  /// Internal.
  [[nodiscard]] const detail::Slice& slice() const noexcept { return slice_; }

  friend bool operator==(const Data& a, const Data& b) noexcept { return a.view() == b.view(); }

 private:
  friend struct detail::Niche<Data>;
  detail::Slice slice_;
};

namespace detail {

template <class T>
struct SliceNiche {
  static constexpr bool exists = true;
  static constexpr T absent() noexcept { return T(Slice::absent()); }
};
template <>
struct Niche<String> : SliceNiche<String> {
  static bool isAbsent(const String& value) noexcept { return value.slice_.isAbsent(); }
};
template <>
struct Niche<Data> : SliceNiche<Data> {
  static bool isAbsent(const Data& value) noexcept { return value.slice_.isAbsent(); }
};

}  // namespace detail

static_assert(sizeof(Optional<String>) == 16 && sizeof(Optional<Data>) == 16);

}  // namespace ironmoat
