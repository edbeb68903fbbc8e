#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <utility>

#include "plist/document.h"

namespace ironmoat::plist {

/// Fills a Document in reading order, for the XML reader and the encoder:
/// `beginDictionary`, then key and value in turn, `end`; `beginArray`, elements, `end`.
///
/// The caller keeps the order (a key before each value, one root, every `begin` ended); a builder
/// whose order was broken must not be finished.
class DocumentBuilder {
 public:
  /// `source` is the block that `sourceString` and `sourceData` point into; it may be none.
  DocumentBuilder(Document& document, BlockRef source, Sharing sharing)
      : document_(document), side_(sharing) {
    document_.source_ = std::move(source);
  }

  /// False where limits::nestedContainers are open already; then none is opened.
  [[nodiscard]] bool beginDictionary() { return begin(Kind::dictionary); }
  [[nodiscard]] bool beginArray() { return begin(Kind::array); }
  void end();
  /// Containers open now.
  [[nodiscard]] std::size_t depth() const noexcept { return open_.size(); }
  /// The innermost open container is a dictionary; requires depth() > 0.
  [[nodiscard]] bool inDictionary() noexcept {
    return document_.nodes_[open_.back().node].kind == Kind::dictionary;
  }

  /// A key is given as a string, like any value.
  void sourceString(std::uint32_t offset, std::uint32_t length) {
    add({Kind::string, false, 0, length, offset});
  }
  void string(std::string_view validUtf8) { addSide(Kind::string, validUtf8); }
  void data(std::string_view bytes) { addSide(Kind::data, bytes); }
  /// What stands in `side()` from `start` on becomes one string or data value.
  void sideValue(Kind kind, std::size_t start) {
    add({kind, true, 0, static_cast<std::uint32_t>(side_.size() - start), start});
  }
  /// Transformed bytes are appended here first, then named with `sideValue`.
  [[nodiscard]] BlockBuilder& side() noexcept { return side_; }

  void integer(std::int64_t value) {
    add({Kind::integer, false, 0, 0, static_cast<std::uint64_t>(value)});
  }
  void boolean(bool value) { add({Kind::boolean, false, 0, 0, value ? 1U : 0U}); }
  /// A value of which only the kind matters, since it fits in no field.
  void opaque(Kind kind) { add({kind, false, 0, 0, 0}); }

  /// Nothing may be added afterwards.
  void finish() { document_.side_ = side_.finish(); }

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
