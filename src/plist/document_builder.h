#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <utility>

#include "plist/document.h"

namespace ironmoat::plist {

/// Builds a Document in reading order, for the XML reader and the encoder: `beginDictionary`, key
/// and value in turn, `end`; `beginArray`, elements, `end`.
///
/// The caller must keep this order: one root, a key before each value, an `end` for each `begin`.
/// Otherwise it must not call `finish`.
class DocumentBuilder {
 public:
  /// `source` is the block that `sourceString` and `sourceData` point into; it may be null.
  DocumentBuilder(Document& document, BlockRef source, Sharing sharing)
      : document_(document), side_(sharing) {
    document_.source_ = std::move(source);
  }

  /// Returns false, and opens nothing, when limits::nestedContainers containers are open.
  [[nodiscard]] bool beginDictionary() { return begin(Kind::dictionary); }
  [[nodiscard]] bool beginArray() { return begin(Kind::array); }
  void end();
  /// The number of open containers.
  [[nodiscard]] std::size_t depth() const noexcept { return open_.size(); }
  /// Whether the innermost open container is a dictionary. Requires depth() > 0.
  [[nodiscard]] bool inDictionary() noexcept {
    return document_.nodes_[open_.back().node].kind == Kind::dictionary;
  }

  /// Also adds keys.
  void sourceString(std::uint32_t offset, std::uint32_t length) {
    add({Kind::string, false, 0, length, offset});
  }
  void string(std::string_view validUtf8) { addSide(Kind::string, validUtf8); }
  void data(std::string_view bytes) { addSide(Kind::data, bytes); }
  /// Adds the bytes of `side()` from `start` on as one string or data value.
  void sideValue(Kind kind, std::size_t start) {
    add({kind, true, 0, static_cast<std::uint32_t>(side_.size() - start), start});
  }
  /// The buffer of transformed bytes, for `sideValue`.
  [[nodiscard]] BlockBuilder& side() noexcept { return side_; }

  void integer(std::int64_t value) {
    add({Kind::integer, false, 0, 0, static_cast<std::uint64_t>(value)});
  }
  void boolean(bool value) { add({Kind::boolean, false, 0, 0, value ? 1U : 0U}); }
  /// Adds a value of a kind that fits in no field.
  void opaque(Kind kind) { add({kind, false, 0, 0, 0}); }

  /// Completes the document. Nothing may be added afterwards.
  void finish() {
    if (side_.size() != 0) side_.reserve(Document::kReadable);
    document_.side_ = side_.finish();
  }

 private:
  struct Open {
    NodeIndex node;
    std::uint32_t firstPending;
  };

  [[nodiscard]] bool begin(Kind kind);
  void add(const Node& node) {
    const auto index = static_cast<NodeIndex>(document_.nodes_.size());
    document_.nodes_.push(node);
    if (!open_.empty()) pending_.push(index);
  }
  void addSide(Kind kind, std::string_view bytes) {
    const std::size_t start = side_.size();
    side_.append(bytes);
    sideValue(kind, start);
  }

  Document& document_;
  BlockBuilder side_;
  ScratchArray<Open, 16> open_;
  ScratchArray<NodeIndex, 64> pending_;  // children of the open containers, innermost last
};

}  // namespace ironmoat::plist
