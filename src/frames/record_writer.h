#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "frames/little_endian.h"
#include "frames/record_layout.h"
#include "ironmoat/limits.h"
#include "values/block_builder.h"

namespace ironmoat::frames {

/// Writes one record.
///
/// Invariant: before each field there is room for the fixed bytes of it and of all later fields of
/// its record, so they are stored without a check. The record claims this room at its start, and
/// again after each part whose size only its content determines.
///
/// `at` is the position of the next byte. It is an argument and a result, not a member, which every
/// field would load and store: a stored byte may alias any object.
class Writer {
 public:
  explicit Writer(BlockBuilder& out)
      : out_(out), start_(out.size()), end_(out.bytes() + out.capacity()) {}

  template <Record R>
  void write(const R& from) {
    settle(record(from, out_.bytes() + start_));
    if (out_.size() - start_ > limits::replyBytes)
      rejectExcess("record", limits::replyBytes, "bytes");
  }

 private:
  /// Claims are upper bounds, so a record within the limit may claim this much more.
  static constexpr std::size_t kSlack = std::size_t{64} << 10;

  template <Record R>
  [[gnu::noinline]] char* record(const R& from, char* at) {
    using Arguments = typename R::Arguments;
    if (++depth_ > limits::nestedContainers)
      rejectExcess("nesting", limits::nestedContainers, "records");
    at = claim(at, Layout<Arguments>::fixed);
    const std::size_t presenceAt = static_cast<std::size_t>(at - out_.bytes());
    auto bits = Layout<Arguments>::required;
    at = fields<Arguments>(typename Arguments::Fields(), from, bits.data(),
                           at + Layout<Arguments>::presence);
    std::memcpy(out_.bytes() + presenceAt, bits.data(), bits.size());
    --depth_;
    return at;
  }

  template <class A, auto... Members>
  [[gnu::always_inline]] char* fields(FieldList<A, Members...>, const A& from, std::uint8_t* bits,
                                      char* at) {
    static_assert(Layout<A>::fixed <= kSlack);
    std::size_t i = 0;
    ((at = field<Layout<A>::fixed>(from.*Members, i++, bits, at)), ...);
    return at;
  }

  template <std::size_t Fixed, class T>
  [[gnu::always_inline]] char* field(const T& from, std::size_t, std::uint8_t*, char* at) {
    return value<Fixed>(from, at);
  }

  template <std::size_t Fixed, class Optional>
  requires requires(const Optional& from) { from.has_value(); }
  [[gnu::always_inline]] char* field(const Optional& from, std::size_t i, std::uint8_t* bits,
                                     char* at) {
    // Most fields are absent: with the hint their tests are next to one another.
    if (from) [[unlikely]] {
      bits[i / 8] |= static_cast<std::uint8_t>(1U << (i % 8));
      return value<Fixed>(*from, at);
    }
    return at;
  }

  // `value` requires room for fixedBytes<T>() at `at`. Unless the size of T is fixed, it leaves
  // room for `Fixed` bytes after it.

  template <std::size_t Fixed, Scalar T>
  char* value(T from, char* at) {
    return store(at, from);
  }

  template <std::size_t Fixed, Text T>
  char* value(const T& from, char* at) {
    return text(from.view(), at, Fixed);
  }

  template <std::size_t Fixed, Record R>
  char* value(const R& from, char* at) {
    return claim(record(from, at), Fixed);
  }

  template <std::size_t Fixed, class T>
  char* value(const List<T>& from, char* at) {
    return from.empty() ? store(at, std::uint32_t{0}) : list(from, at, Fixed);
  }

  template <class T>
  [[gnu::noinline]] char* list(const List<T>& from, char* at, std::size_t behind) {
    at = store(at, static_cast<std::uint32_t>(from.size()));
    for (const T& element : from) at = value<0>(element, claim(at, fixedBytes<T>()));
    return claim(at, behind);
  }

  /// No overflow: a text is shorter than 4 GiB.
  [[gnu::noinline]] char* text(std::string_view from, char* at, std::size_t behind) {
    at = store(at, static_cast<std::uint32_t>(from.size()));
    at = claim(at, from.size() + behind);
    if (!from.empty()) std::memcpy(at, from.data(), from.size());
    return at + from.size();
  }

  char* claim(char* at, std::size_t count) {
    return count > static_cast<std::size_t>(end_ - at) ? grow(at, count) : at;
  }

  [[gnu::cold, gnu::noinline]] char* grow(char* at, std::size_t count) {
    settle(at);
    // No overflow: `count` is at most little more than 4 GiB, and the builder's size less.
    if (out_.size() - start_ + count > limits::replyBytes + kSlack) {
      rejectExcess("record", limits::replyBytes, "bytes");
    }
    out_.reserve(count);
    end_ = out_.bytes() + out_.capacity();
    return out_.bytes() + out_.size();
  }

  /// Tells the builder how much of its room is written.
  void settle(const char* at) {
    out_.extend(static_cast<std::size_t>(at - (out_.bytes() + out_.size())));
  }

  BlockBuilder& out_;
  const std::size_t start_;
  char* end_;  // of the room in `out_`
  std::uint32_t depth_ = 0;
};

}  // namespace ironmoat::frames
