#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <utility>

#include "frames/little_endian.h"
#include "frames/record_layout.h"
#include "ironmoat/limits.h"
#include "values/utf8.h"

namespace ironmoat::frames {

/// Reads one record from an untrusted body.
class Reader {
 public:
  explicit Reader(const Data& body)
      : block_(body.slice().block()), at_(body.view().data()), end_(at_ + body.size()) {}

  template <Record R>
  [[gnu::noinline]] void record(typename R::Arguments& into) {
    using Arguments = typename R::Arguments;
    if (++depth_ > limits::nestedContainers)
      rejectExcess("nesting", limits::nestedContainers, "records");
    const char* const bits = take(Layout<Arguments>::presence);
    checkPresence<Layout<Arguments>>(bits);
    fields<Arguments>(typename Arguments::Fields(), into, bits);
    --depth_;
  }

  void finish() const {
    if (at_ != end_) reject("unexpected bytes after the record");
  }
  /// As limits::recordBytes counts them.
  [[nodiscard]] std::size_t recordBytes() const noexcept {
    return limits::recordBytes - recordBytes_;
  }

 private:
  template <class L>
  static void checkPresence(const char* bits) {
    std::uint8_t missing = 0;
    for (std::size_t i = 0; i < L::presence; ++i) {
      missing |= static_cast<std::uint8_t>(L::required[i] & ~static_cast<std::uint8_t>(bits[i]));
    }
    if (missing != 0) reject("missing required field");
    if ((static_cast<std::uint8_t>(bits[L::presence - 1]) & L::unusedInLast) != 0) {
      reject("unexpected presence bit");
    }
  }

  template <class A, auto... Members>
  [[gnu::always_inline]] void fields(FieldList<A, Members...>, A& into, const char* bits) {
    if constexpr (detail::SparseRecord<A>) makeRoom<FieldList<A, Members...>>(into, bits);
    std::size_t i = 0;
    (field(into.*Members, i++, bits), ...);
  }

  template <class Fields>
  void makeRoom(detail::SparseValues& into, const char* bits) {
    std::size_t count = 0;
    std::size_t i = 0;
    Fields::forEach([&](auto field) {
      if constexpr (field.sparse) count += static_cast<std::uint8_t>(bits[i / 8]) >> (i % 8) & 1U;
      ++i;
    });
    chargeRecords(count, sizeof(detail::Cell));
    into.reserve(count);
  }
  void chargeRecords(std::size_t count, std::size_t size) {
    if (count > recordBytes_ / size) rejectExcess("memory of lists", limits::recordBytes, "bytes");
    recordBytes_ -= count * size;
  }

  template <class T>
  [[gnu::always_inline]] void field(T& into, std::size_t, const char*) {
    into = read<T>();
  }

  template <class T>
  [[gnu::always_inline]] void field(List<T>& into, std::size_t, const char*) {
    fill(into);
  }

  template <class T>
  [[gnu::always_inline]] void field(Optional<T>& into, std::size_t i, const char* bits) {
    if ((bits[i / 8] >> (i % 8) & 1) == 0) return;
    // An absent field owns nothing: to construct over it saves the moves of an assignment.
    if constexpr (kIsList<T>) {
      fill(**std::construct_at(&into, T()));
    } else {
      std::construct_at(&into, read<T>());
    }
  }

  template <class R, class T, std::size_t Index>
  [[gnu::always_inline]] void field(SparseField<R, T, Index>& into, std::size_t i,
                                    const char* bits) {
    if ((bits[i / 8] >> (i % 8) & 1) != 0) into.append(read<T>());
  }

  template <class T>
  T read() {
    if constexpr (Number<T>) {
      return load<T>(take(sizeof(T)));
    } else if constexpr (std::same_as<T, Bool>) {
      const char byte = *take(1);
      if (byte != 0 && byte != 1) reject("not a valid Bool");
      return byte == 1;
    } else if constexpr (std::same_as<T, Data>) {
      return Data(bytes());
    } else if constexpr (std::same_as<T, String>) {
      return text();
    } else {
      return nested<T>();
    }
  }

  /// A record outside of lists is on the stack while its fields are read, so it must be small.
  template <Record R>
  [[gnu::noinline]] R nested() {
    static_assert(sizeof(R) <= 512);
    return R([&] {
      typename R::Arguments arguments{};
      record<R>(arguments);
      return arguments;
    });
  }

  template <class T>
  [[gnu::noinline]] void fill(List<T>& elements) {
    static_assert(minBytes<T>() > 0, "a few bytes must not announce any number of elements");
    const std::size_t count = load<std::uint32_t>(take(4));
    if (count > left() / minBytes<T>()) reject("list exceeds the rest of the record");
    chargeRecords(count, sizeof(T));
    if (count == 0) return;
    elements.reserve(count);
    if constexpr (Record<T>) {
      // Off the stack: here records of kilobytes nest.
      const auto arguments = std::make_unique<std::optional<typename T::Arguments>>();
      for (std::size_t i = 0; i < count; ++i) {
        record<T>(arguments->emplace());
        append(elements, **arguments);
      }
    } else {
      for (std::size_t i = 0; i < count; ++i) elements.push_back(read<T>());
    }
  }

  /// Not inline, so that nested records do not hold its stack frame.
  template <Record R>
  [[gnu::noinline]] static void append(List<R>& to, typename R::Arguments& arguments) {
    to.emplace_back([&] { return typename R::Arguments(std::move(arguments)); });
  }

  [[gnu::noinline]] String text() {
    detail::Slice text = bytes();
    if (!isValidUtf8(text.view())) reject("not a valid UTF-8 text");
    return String(std::move(text));
  }

  [[gnu::noinline]] detail::Slice bytes() {
    const std::size_t length = load<std::uint32_t>(take(4));
    const char* const first = take(length);
    if (length > deliveredBytes_)
      rejectExcess("size of text and data", limits::deliveredBytes, "bytes");
    deliveredBytes_ -= length;
    return {block_, static_cast<std::uint32_t>(first - block_->bytes()),
            static_cast<std::uint32_t>(length)};
  }

  const char* take(std::size_t count) {
    if (count > left()) reject("unexpected end of record");
    return std::exchange(at_, at_ + count);
  }
  [[nodiscard]] std::size_t left() const noexcept { return static_cast<std::size_t>(end_ - at_); }

  Block* const block_;
  const char* at_;
  const char* const end_;
  std::size_t recordBytes_ = limits::recordBytes;
  std::size_t deliveredBytes_ = limits::deliveredBytes;
  std::uint32_t depth_ = 0;
};

}  // namespace ironmoat::frames
