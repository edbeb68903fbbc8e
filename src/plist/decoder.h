#pragma once

#include <array>
#include <bit>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "ironmoat/errors.h"
#include "ironmoat/limits.h"
#include "ironmoat/values.h"
#include "plist/document.h"

namespace ironmoat::plist {

/// What the decoders of one message share: what it may still cost, see ironmoat/limits.h, and its
/// bytes, in which errors name a place.
struct Budget {
  std::size_t recordBytes = limits::recordBytes;
  std::size_t deliveredBytes = limits::deliveredBytes;
  std::size_t scannedEntries = limits::scannedEntries;
  const Data* message = nullptr;  ///< none: errors have no offset
};

template <class Keys>
class KeyedDecodingContainer;

/// A decoder positioned on one value of a document. Lives on the stack, below its parent's; knows
/// the way from the top, so that an error can name it.
class Decoder {
 public:
  Decoder(const Document& document, Budget& budget) noexcept
      : document_(document), budget_(budget), node_(document.root()) {}
  /// The value under `key`, which must outlive the decoder, or the element at `index`.
  Decoder(const Decoder& parent, const std::string_view& key, NodeIndex node) noexcept
      : document_(parent.document_),
        budget_(parent.budget_),
        parent_(&parent),
        key_(&key),
        node_(node) {}
  Decoder(const Decoder& parent, std::uint32_t index, NodeIndex node) noexcept
      : document_(parent.document_),
        budget_(parent.budget_),
        parent_(&parent),
        index_(index),
        node_(node) {}
  Decoder(const Decoder&) = delete;
  Decoder& operator=(const Decoder&) = delete;

  /// The current value's entries under the record's keys; throws `typeMismatch` when the value is
  /// no dictionary.
  template <class Keys>
  [[nodiscard]] KeyedDecodingContainer<Keys> container() const {
    return KeyedDecodingContainer<Keys>(*this);
  }

  [[nodiscard]] const Document& document() const noexcept { return document_; }
  [[nodiscard]] const Node& node() const noexcept { return document_.node(node_); }

  /// The current node; throws `typeMismatch` when it is of another kind.
  const Node& expect(Kind kind) const {
    const Node& node = this->node();
    if (node.kind != kind) failMismatch(kind);
    return node;
  }
  void chargeRecords(std::size_t count, std::size_t size) const {
    charge(budget_.recordBytes, count * size, "lists take more memory than the limit of ",
           limits::recordBytes, " bytes");
  }
  void chargeDelivered(std::size_t bytes) const {
    charge(budget_.deliveredBytes, bytes, "text and data come to more than the limit of ",
           limits::deliveredBytes, " bytes");
  }
  void chargeScanned(std::size_t entries) const {
    charge(budget_.scannedEntries, entries, "shared dictionaries come to more than the limit of ",
           limits::scannedEntries, " entries");
  }

  [[noreturn]] void failMismatch(Kind expected) const;
  [[noreturn]] void failOutOfRange() const;
  [[noreturn]] void failMissing(std::string_view key) const;

 private:
  void charge(std::size_t& left, std::size_t amount, const char* what, std::size_t limit,
              const char* unit) const {
    if (amount > left) failLimit(what, limit, unit);
    left -= amount;
  }
  [[noreturn]] void failLimit(const char* what, std::size_t limit, const char* unit) const;
  [[nodiscard]] DecodingError mismatch(Kind expected) const;
  [[nodiscard]] DecodingError outOfRange() const;
  [[nodiscard]] DecodingError missing(std::string_view key) const;
  [[nodiscard]] std::string path() const;
  [[nodiscard]] std::optional<std::uint64_t> offset() const;

  const Document& document_;
  Budget& budget_;
  const Decoder* parent_ = nullptr;
  const std::string_view* key_ = nullptr;
  std::uint32_t index_ = 0;
  NodeIndex node_;
};

template <class T>
concept Scalar = std::same_as<T, Int> || std::same_as<T, Int64> || std::same_as<T, Bool> ||
    std::same_as<T, String> || std::same_as<T, Data>;

/// The current value as a field of type T.
template <Scalar T>
T decodeScalar(const Decoder& decoder) {
  if constexpr (std::same_as<T, Bool>) {
    return decoder.expect(Kind::boolean).payload != 0;
  } else if constexpr (std::same_as<T, String> || std::same_as<T, Data>) {
    const Node& node = decoder.expect(std::same_as<T, String> ? Kind::string : Kind::data);
    decoder.chargeDelivered(node.count);
    return T(decoder.document().slice(node));
  } else {
    if (decoder.node().kind == Kind::unsignedInteger) decoder.failOutOfRange();
    return static_cast<T>(decoder.expect(Kind::integer).payload);
  }
}

/// The same into a value that is there already. Records bring an overload of their own.
template <Scalar T>
void decodeInto(const Decoder& decoder, T& value) {
  value = decodeScalar<T>(decoder);
}
template <class T>
void decodeInto(const Decoder& decoder, List<T>& list) {
  const Node& array = decoder.expect(Kind::array);
  decoder.chargeRecords(array.count, sizeof(T));
  list.reserve(array.count);  // proven by the document, paid for by the budget
  std::uint32_t index = 0;
  for (const NodeIndex element : decoder.document().elements(array)) {
    decodeInto(Decoder(decoder, index++, element), list.emplace_back());
  }
}

/// A dictionary, seen through an enumeration of keys: `Keys::count`, `Keys::at(index)`,
/// `index()`, `stringValue()`, and `Keys::finder()`, which maps text to a case. Of several entries
/// under one key the last one counts; entries under other keys are passed over.
template <class Keys>
class KeyedDecodingContainer {
 public:
  explicit KeyedDecodingContainer(const Decoder& decoder) : decoder_(decoder) {
    const Node& dictionary = decoder.expect(Kind::dictionary);
    decoder.chargeScanned(dictionary.count);
    const Document& document = decoder.document();
    const auto keys = document.keys(dictionary);
    const auto values = document.values(dictionary);
    const auto& find = Keys::finder();
    for (std::size_t i = 0; i < keys.size(); ++i) {
      // Keys of a large dictionary may lie anywhere: without this, two cache misses in a row for
      // each (4 times the time of the worst message).
      if (keys.size() - i > 2 * kAhead) {
        __builtin_prefetch(&document.node(keys[i + 2 * kAhead]));
        __builtin_prefetch(document.text(document.node(keys[i + kAhead])).data());
      }
      const std::optional<Keys> key = find(document.text(document.node(keys[i])));
      if (!key) continue;
      seen_[key->index() / 64] |= std::uint64_t{1} << (key->index() % 64);
      values_[key->index()] = values[i];
    }
  }

  [[nodiscard]] bool contains(Keys key) const noexcept {
    return ((seen_[key.index() / 64] >> (key.index() % 64)) & 1) != 0;
  }

  /// Throws `keyNotFound` when there is no entry, and what decoding its value throws.
  template <class T>
  [[nodiscard]] T decode(Keys key) const {
    T value{};
    decodeField(key, value);
    return value;
  }
  template <class T>
  [[nodiscard]] Optional<T> decodeIfPresent(Keys key) const {
    Optional<T> value;
    if (contains(key)) decodeField(key, value);
    return value;
  }

  /// The same, into a record's member in place: a plain member is required; an optional one must
  /// have been seen, and be absent so far.
  template <class T>
  void decodeField(Keys key, T& value) const {
    if (!contains(key)) decoder_.failMissing(key.stringValue());
    decodeInto(Decoder(decoder_, key.stringValue(), values_[key.index()]), value);
  }
  template <class T>
  void decodeField(Keys key, Optional<T>& value) const {
    const Decoder decoder(decoder_, key.stringValue(), values_[key.index()]);
    if constexpr (Scalar<T>) {
      std::construct_at(&value, decodeScalar<T>(decoder));  // absent so far: it owns nothing
    } else {
      value = Optional<T>(T{});
      decodeInto(decoder, *value);
    }
  }

  /// Calls `visit(key)` in the order of the cases, for each that was seen and each in `required`.
  template <class Visitor>
  void forEach(const std::array<std::uint64_t, (Keys::count + 63) / 64>& required,
               Visitor&& visit) const {
    for (std::size_t word = 0; word < seen_.size(); ++word) {
      for (std::uint64_t left = seen_[word] | required[word]; left != 0; left &= left - 1) {
        visit(Keys::at(word * 64 + static_cast<std::size_t>(std::countr_zero(left))));
      }
    }
  }

 private:
  static constexpr std::size_t kAhead = 16;

  const Decoder& decoder_;
  std::array<std::uint64_t, (Keys::count + 63) / 64> seen_{};
  std::array<NodeIndex, Keys::count> values_;  // NOLINT: read only where seen_ says so
};

}  // namespace ironmoat::plist
