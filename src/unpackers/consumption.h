#pragma once

#include <cstddef>
#include <memory>
#include <type_traits>
#include <utility>

#include "ironmoat/values.h"
#include "unpackers/conversion.h"

namespace ironmoat {

/// A wire record, or a list of them, which conversion consumes: converting a record moves out of it
/// and ends it, so that nobody looks through its fields again, and a list's memory goes back before
/// the lists around it are converted. Converting from unchanged records instead takes 5 % more time
/// for the benchmark's message `full` and 9 % more for `fanout` (binary; 7 % more instructions).
///
/// Records are consumed from the first to the last; those left when an initialiser throws are
/// destroyed with this.
template <class Storage>
class Consumable {
  static constexpr bool kIsRecord = requires { typename Storage::CodingKeys; };

 public:
  /// One record without fields. A constant, so that it is cleared as one block.
  Consumable() requires kIsRecord : storage_() {}
  explicit Consumable(Storage&& list) noexcept requires(!kIsRecord) : storage_(std::move(list)) {
    // All of the first record at once: in a chain of lists its fields would be waited for one after
    // the other. The records behind it the processor fetches by itself.
    if (storage_.empty()) return;
    const char* const first = reinterpret_cast<const char*>(storage_.data());
    for (std::size_t i = 0; i < sizeof storage_[0]; i += kCacheLine) __builtin_prefetch(first + i);
  }
  Consumable(const Consumable&) = delete;
  Consumable& operator=(const Consumable&) = delete;
  ~Consumable() {
    for (; !done(); ++next_) std::destroy_at(&current());
    if constexpr (!kIsRecord) {  // what the list's own destructor does, but for its records
      if (storage_.capacity() != 0) {
        storage_.get_allocator().deallocate(storage_.data(), storage_.capacity());
      }
    }
  }

  [[nodiscard]] std::size_t size() const noexcept {
    if constexpr (kIsRecord) {
      return 1;
    } else {
      return storage_.size();
    }
  }
  [[nodiscard]] bool done() const noexcept { return next_ == size(); }
  /// Requires !done().
  [[nodiscard]] auto& current() noexcept {
    if constexpr (kIsRecord) {
      return storage_;
    } else {
      return storage_[next_];
    }
  }
  /// The arguments of the current record's output, `converted` among them; ends the record: what
  /// was converted is destroyed here, and every other field taken, or moved from, after which it
  /// owns nothing (argumentOf checks it). Requires !done().
  template <class Output, class Converted>
  typename Output::Arguments consume(Converted&& converted) noexcept {
    auto& record = current();
    ++next_;
    std::remove_cvref_t<Converted>::Fields::forEach([&]<class Part>(Part) {
      std::destroy_at(&detail::FieldNamed<std::remove_cvref_t<decltype(record)>, Part>::in(record));
    });
    return detail::argumentsFrom<Output, detail::Wires::abandoned>(record, converted);
  }

 private:
  static constexpr std::size_t kCacheLine = 64;

  union {
    Storage storage_;  // never destroyed as such: that would look through the records again
  };
  std::size_t next_ = 0;
};

}  // namespace ironmoat
