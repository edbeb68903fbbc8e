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
/// Room is claimed for all that is fixed in a record at once, and again after each part whose
/// size is only known at run time; so before each field there is room for the fixed parts of it
/// and of all fields behind it, and these are stored without a check.
class Writer {
 public:
  explicit Writer(BlockBuilder& out) : out_(out), start_(out.size()) {}

  template <Record R>
  [[gnu::noinline]] void record(const R& record) {
    using Arguments = typename R::Arguments;
    if (++depth_ > limits::nestedContainers) refuse("records are nested too deeply");
    claim(Layout<Arguments>::fixed);
    const std::size_t presenceAt = static_cast<std::size_t>(at_ - out_.bytes());
    at_ += Layout<Arguments>::presence;
    auto bits = Layout<Arguments>::required;
    fields<Arguments>(typename Arguments::Fields(), record, bits.data());
    std::memcpy(out_.bytes() + presenceAt, bits.data(), bits.size());
    --depth_;
  }

  void finish() {
    settle();
    if (out_.size() - start_ > limits::replyBytes) refuse("the record is too large for a reply");
  }

 private:
  /// Claims are upper bounds: only `finish` knows what was used of them.
  static constexpr std::size_t kSlack = std::size_t{64} << 10;

  template <class A, auto... Members>
  [[gnu::always_inline]] void fields(FieldList<A, Members...>, const A& from, std::uint8_t* bits) {
    static_assert(Layout<A>::fixed <= kSlack);
    std::size_t i = 0;
    (field<Layout<A>::fixed>(from.*Members, i++, bits), ...);
  }

  template <std::size_t Fixed, class T>
  [[gnu::always_inline]] void field(const T& from, std::size_t, std::uint8_t*) {
    value(from);
    if constexpr (!Scalar<T>) claim(Fixed);
  }

  template <std::size_t Fixed, class T>
  [[gnu::always_inline]] void field(const Optional<T>& from, std::size_t i, std::uint8_t* bits) {
    if (!from) return;
    bits[i / 8] |= static_cast<std::uint8_t>(1U << (i % 8));
    field<Fixed>(*from, i, bits);
  }

  // `value` finds room for fixedBytes<T>().

  template <Scalar T>
  void value(T from) {
    at_ = store(at_, from);
  }

  template <Text T>
  void value(const T& from) {
    text(from.view());
  }

  template <Record R>
  void value(const R& from) {
    record(from);
  }

  template <class T>
  [[gnu::noinline]] void value(const List<T>& from) {
    at_ = store(at_, static_cast<std::uint32_t>(from.size()));
    for (const T& element : from) {
      claim(fixedBytes<T>());
      value(element);
    }
  }

  [[gnu::noinline]] void text(std::string_view from) {
    at_ = store(at_, static_cast<std::uint32_t>(from.size()));
    claim(from.size());
    if (!from.empty()) std::memcpy(at_, from.data(), from.size());
    at_ += from.size();
  }

  void claim(std::size_t count) {
    if (count > static_cast<std::size_t>(end_ - at_)) grow(count);
  }

  [[gnu::noinline]] void grow(std::size_t count) {
    settle();
    // No overflow: a text has less than 4 GiB, and the builder less than that again.
    if (out_.size() - start_ + count > limits::replyBytes + kSlack) {
      refuse("the record is too large for a reply");
    }
    out_.reserve(count);
    at_ = out_.bytes() + out_.size();
    end_ = out_.bytes() + out_.capacity();
  }

  /// Tells the builder how much was written into its room.
  void settle() {
    if (at_ != nullptr) out_.extend(static_cast<std::size_t>(at_ - (out_.bytes() + out_.size())));
  }

  BlockBuilder& out_;
  const std::size_t start_;
  char* at_ = nullptr;  // [at_, end_) is reserved in `out_`
  char* end_ = nullptr;
  std::uint32_t depth_ = 0;
};

}  // namespace ironmoat::frames
