#pragma once

#include <array>
#include <bit>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "ironmoat/errors.h"
#include "ironmoat/limits.h"
#include "ironmoat/sparse_values.h"
#include "ironmoat/values.h"
#include "plist/document.h"
#include "values/record_arena.h"
#include "values/unknown_keys.h"

namespace ironmoat::plist {

/// The remaining cost that a message may incur (ironmoat/limits.h).
struct Budget {
  std::size_t recordBytes = limits::recordBytes;
  std::size_t deliveredBytes = limits::deliveredBytes;
  std::size_t scannedEntries = limits::scannedEntries;
};

/// The state that all decoders of one message share.
struct Decoding {
  const Document& document;
  const Data* message = nullptr;  ///< for the offset of a rejection; null: without an offset
  Budget budget = {};
  std::optional<DecodingError> rejection = {};  ///< set by the decoder that rejects the message
  UnknownKeysArguments* unknownKeys = nullptr;  ///< collects them; null: nobody asks for them
  ironmoat::detail::RecordArena arena{document.sharing()};
};

template <class Keys>
class KeyedDecodingContainer;

/// A decoder positioned on one value of a document. Must not outlive its parent, which it links to
/// so that a rejection can give the path.
///
/// Decoding functions return false when they reject the message. The reason is then in
/// `Decoding::rejection`, and the fields decoded so far must not be used.
class Decoder {
 public:
  explicit Decoder(Decoding& decoding) noexcept
      : document_(decoding.document), decoding_(decoding), node_(decoding.document.root()) {}
  /// The value under `key`, which must outlive the decoder, or the element at `index`.
  Decoder(const Decoder& parent, const std::string_view& key, NodeIndex node) noexcept
      : document_(parent.document_),
        decoding_(parent.decoding_),
        parent_(&parent),
        key_(&key),
        node_(node) {}
  Decoder(const Decoder& parent, std::uint32_t index, NodeIndex node) noexcept
      : document_(parent.document_),
        decoding_(parent.decoding_),
        parent_(&parent),
        index_(index),
        node_(node) {}
  Decoder(const Decoder&) = delete;
  Decoder& operator=(const Decoder&) = delete;

  /// The current value as a dictionary. Rejects any other kind; the container is then false.
  template <class Keys>
  [[nodiscard]] KeyedDecodingContainer<Keys> container() const {
    return KeyedDecodingContainer<Keys>(*this);
  }

  [[nodiscard]] const Document& document() const noexcept { return document_; }
  [[nodiscard]] const Node& node() const noexcept { return document_.node(node_); }

  /// Requires the current node to be of `kind`; otherwise rejects the message as a type mismatch.
  [[nodiscard]] bool expect(Kind kind) const {
    if (node().kind == kind) return true;
    rejectMismatch(kind);
    return false;
  }
  [[nodiscard]] bool chargeRecords(std::size_t count, std::size_t size) const {
    return charge(decoding_.budget.recordBytes, count * size,
                  "memory of lists exceeds the limit of ", limits::recordBytes, " bytes");
  }
  [[nodiscard]] bool chargeDelivered(std::size_t bytes) const {
    return charge(decoding_.budget.deliveredBytes, bytes,
                  "size of text and data exceeds the limit of ", limits::deliveredBytes, " bytes");
  }
  /// chargeDelivered, but for the rejection: whoever gets false asks for it.
  [[nodiscard]] bool takeDelivered(std::size_t bytes) const noexcept {
    std::size_t& left = decoding_.budget.deliveredBytes;
    if (bytes > left) return false;
    left -= bytes;
    return true;
  }
  [[nodiscard]] bool chargeScanned(std::size_t entries) const {
    return charge(decoding_.budget.scannedEntries, entries,
                  "size of shared dictionaries exceeds the limit of ", limits::scannedEntries,
                  " entries");
  }

  /// Reserves memory for `count` values of a sparse record, or elements of a list.
  template <class Values>
  void reserve(Values& values, std::size_t count) const {
    const ironmoat::detail::RecordArena::Scope scope(decoding_.arena);
    values.reserve(count);
  }

  [[gnu::cold]] void rejectMismatch(Kind expected) const;
  [[gnu::cold]] void rejectOutOfRange() const;
  /// Rejects a value that is not of this kind, or not within its budget.
  [[gnu::cold, gnu::noinline]] void rejectScalar(Kind expected) const;
  [[gnu::cold]] void rejectMissing(const std::string_view& key) const;

  [[nodiscard]] bool collectsUnknownKeys() const noexcept {
    return decoding_.unknownKeys != nullptr;
  }
  /// Requires collectsUnknownKeys().
  [[gnu::cold]] void addUnknownKey(std::string_view key) const;

 private:
  bool charge(std::size_t& left, std::size_t amount, const char* what, std::size_t limit,
              const char* unit) const {
    if (amount > left) {
      rejectLimit(what, limit, unit);
      return false;
    }
    left -= amount;
    return true;
  }
  [[gnu::cold]] void rejectLimit(const char* what, std::size_t limit, const char* unit) const;
  void reject(DecodingError::Kind kind, const std::string& description) const;
  [[nodiscard]] std::string path() const;
  [[nodiscard]] std::optional<std::uint64_t> offset() const;

  const Document& document_;
  Decoding& decoding_;
  const Decoder* parent_ = nullptr;
  const std::string_view* key_ = nullptr;
  std::uint32_t index_ = 0;
  NodeIndex node_;
};

template <class T>
concept Scalar = std::same_as<T, Int> || std::same_as<T, Int64> || std::same_as<T, Bool> ||
    std::same_as<T, String> || std::same_as<T, Data>;

/// Requires a value that a field of type T can hold, and charges its bytes to the budget.
template <Scalar T>
[[nodiscard]] bool admitsScalar(const Decoder& decoder) {
  if constexpr (std::same_as<T, Bool>) {
    return decoder.expect(Kind::boolean);
  } else if constexpr (std::same_as<T, String> || std::same_as<T, Data>) {
    return decoder.expect(std::same_as<T, String> ? Kind::string : Kind::data) &&
           decoder.chargeDelivered(decoder.node().count);
  } else {
    if (decoder.node().kind != Kind::wideInteger) return decoder.expect(Kind::integer);
    decoder.rejectOutOfRange();
    return false;
  }
}
/// The value. Requires a preceding admitsScalar().
template <Scalar T>
T scalar(const Decoder& decoder) {
  const Node& node = decoder.node();
  if constexpr (std::same_as<T, Bool>) {
    return node.payload != 0;
  } else if constexpr (std::same_as<T, String> || std::same_as<T, Data>) {
    return T(decoder.document().slice(node));
  } else {
    return static_cast<T>(node.payload);
  }
}

/// Decodes the current value into an existing field.
template <Scalar T>
[[nodiscard]] bool decodeInto(const Decoder& decoder, T& value) {
  if (!admitsScalar<T>(decoder)) return false;
  value = scalar<T>(decoder);
  return true;
}
template <class R>
requires requires(const Decoder& decoder, R& record) { record.decode(decoder); }
[[nodiscard]] bool decodeInto(const Decoder& decoder, R& record) { return record.decode(decoder); }
template <class T>
[[nodiscard]] bool decodeInto(const Decoder& decoder, List<T>& list) {
  if (!decoder.expect(Kind::array)) return false;
  const Node& array = decoder.node();
  if (!decoder.chargeRecords(array.count, sizeof(T))) return false;
  decoder.reserve(list, array.count);  // proven by the document, paid for by the budget
  std::uint32_t index = 0;
  for (const NodeIndex element : decoder.document().elements(array)) {
    if (!decodeInto(Decoder(decoder, index++, element), list.emplace_back())) return false;
  }
  return true;
}

/// A dictionary, seen through an enumeration of keys: `Keys::count`, `Keys::at(index)`,
/// `index()`, `stringValue()`, and `Keys::finder()`, which maps text to the index of a case. The
/// last of several entries under one key counts. Entries under unknown keys are ignored, but for
/// Decoding::unknownKeys.
template <class Keys>
class KeyedDecodingContainer {
 public:
  using KeySet = std::array<std::uint64_t, (Keys::count + 63) / 64>;  ///< bit i % 64 of word i / 64

  explicit KeyedDecodingContainer(const Decoder& decoder)
      : decoder_(decoder),
        open_(decoder.expect(Kind::dictionary) && decoder.chargeScanned(decoder.node().count)) {
    if (!open_) return;
    findEntries();
    if (decoder.collectsUnknownKeys()) [[unlikely]]
      addUnknownKeys();
  }

  /// Whether the value is a dictionary. All other members require it.
  explicit operator bool() const noexcept { return open_; }

  [[nodiscard]] bool contains(Keys key) const noexcept {
    return ((seen_[key.index() / 64] >> (key.index() % 64)) & 1) != 0;
  }

  /// Decodes the entry under `key`; rejects the message if there is none.
  template <class T>
  [[nodiscard]] bool decode(T& value, Keys key) const {
    if (contains(key)) {
      return decodeInto(Decoder(decoder_, key.stringValue(), values_[key.index()]), value);
    }
    decoder_.rejectMissing(key.stringValue());
    return false;
  }
  /// Decodes the entry under `key` if there is one. `value` must be absent.
  template <class T>
  [[nodiscard]] bool decodeIfPresent(Optional<T>& value, Keys key) const {
    return !contains(key) || decodeInto(Decoder(decoder_, key.stringValue(), values_[key.index()]),
                                        *(value = Optional<T>(T{})));
  }
  /// The entry under `key`, which must be one of `kind`, as the value of the sparse field of the
  /// key's index; requires an entry, and of `values` what SparseValues::append does. Takes over one
  /// of `references` if it holds the same block.
  [[nodiscard]] bool append(ironmoat::detail::SparseValues& values, Keys key, Kind kind,
                            References& references) const {
    const Document& document = decoder_.document();
    const Node& node = document.node(values_[key.index()]);
    if (node.kind != kind || !decoder_.takeDelivered(node.count)) [[unlikely]] {
      Decoder(decoder_, key.stringValue(), values_[key.index()]).rejectScalar(kind);
      return false;
    }
    values.append(key.index(), document.cell(node, references));
    return true;
  }
  /// How many of `keys` have an entry.
  [[nodiscard]] std::size_t countOf(const KeySet& keys) const noexcept {
    std::size_t count = 0;
    for (std::size_t word = 0; word < keys.size(); ++word) {
      count += static_cast<std::size_t>(std::popcount(seen_[word] & keys[word]));
    }
    return count;
  }

  /// Calls `visit(key)` in the order of the cases for each key that has an entry or is in
  /// `required`. Stops, and returns false, when a call returns false.
  template <class Visitor>
  [[nodiscard]] bool forEach(const KeySet& required, Visitor&& visit) const {
    for (std::size_t word = 0; word < seen_.size(); ++word) {
      for (std::uint64_t left = seen_[word] | required[word]; left != 0; left &= left - 1) {
        if (!visit(Keys::at(word * 64 + static_cast<std::size_t>(std::countr_zero(left))))) {
          return false;
        }
      }
    }
    return true;
  }

 private:
  void findEntries() {
    const Document& document = decoder_.document();
    const Node& dictionary = decoder_.node();
    const auto keys = document.keys(dictionary);
    const auto values = document.values(dictionary);
    const auto& index = Keys::finder();
    for (std::size_t i = 0; i < keys.size(); ++i) {
      const std::size_t place = index.findReadable(document.text(document.node(keys[i])));
      if (place >= Keys::count) continue;
      seen_[place / 64] |= std::uint64_t{1} << (place % 64);
      values_[place] = values[i];
    }
  }

  /// A pass of its own, so that the other one costs nothing more.
  [[gnu::cold, gnu::noinline]] void addUnknownKeys() const {
    const Document& document = decoder_.document();
    for (const NodeIndex key : document.keys(decoder_.node())) {
      const std::string_view text = document.text(document.node(key));
      if (Keys::finder().findReadable(text) >= Keys::count) decoder_.addUnknownKey(text);
    }
  }

  const Decoder& decoder_;
  KeySet seen_{};
  std::array<NodeIndex, Keys::count> values_;  // NOLINT: read only where seen_ says so
  bool open_;
};

}  // namespace ironmoat::plist
