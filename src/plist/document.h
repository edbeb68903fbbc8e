#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

#include "ironmoat/sparse_values.h"
#include "ironmoat/values.h"
#include "plist/scratch_array.h"
#include "values/block_builder.h"

namespace ironmoat::plist {

enum class Kind : std::uint8_t {
  dictionary,
  array,
  set,
  string,
  data,
  integer,  ///< fits in a signed 64-bit integer
  boolean,
  // Fit in no field, so that their values are not kept:
  wideInteger,  ///< an integer that needs more than 64 bits with a sign
  real,
  date,
  uid,
  null,
};

/// The name in descriptions: "dictionary", "data", "integer", ...
std::string_view nameOf(Kind kind) noexcept;

/// The index of a node in its document.
using NodeIndex = std::uint32_t;

/// One value, in 16 bytes.
struct Node {
  Kind kind;
  bool transformed;       ///< string, data: the bytes are in the side block, not the source
  std::uint16_t height;   ///< containers on the longest way down, this one included; scalars 0
  std::uint32_t count;    ///< dictionary: entries; array, set: elements; string, data: bytes; or 0
  std::uint64_t payload;  ///< containers: first child; string, data: offset; scalars: the value
};
static_assert(sizeof(Node) == 16);

/// References to a block, taken in one step; the destructor releases those that are left.
class References {
 public:
  References(Block* block, std::size_t count) noexcept : block_(block), left_(count) {
    if (block_ != nullptr) block_->retain(count);
  }
  References(const References&) = delete;
  References& operator=(const References&) = delete;
  ~References() {
    if (block_ != nullptr && left_ > 0) block_->release(left_);
  }
  /// Requires one to be left. The caller releases it.
  void takeOne() noexcept { --left_; }

 private:
  Block* block_;
  std::size_t left_;
};

/// A whole property list as an array of nodes. Each container has a span of child indices; that of
/// a dictionary has all keys, then all values. Text and data are ranges of two blocks: the source
/// block (the message) for literal bytes, and the side block for transformed ones (UTF-16,
/// entities, base64).
///
/// Invariants, established by BinaryReader and DocumentBuilder: indices and ranges are in bounds;
/// keys are strings; strings are valid UTF-8; there is no cycle below the root, and no path through
/// more than limits::nestedContainers containers; kReadable bytes of memory follow the beginning of
/// each text, be it shorter. A node may have several parents.
class Document {
 public:
  static constexpr std::size_t kReadable = 8;

  Document() noexcept = default;
  Document(const Document&) = delete;
  Document& operator=(const Document&) = delete;

  [[nodiscard]] NodeIndex root() const noexcept { return root_; }
  [[nodiscard]] const Node& node(NodeIndex index) const noexcept { return nodes_[index]; }

  [[nodiscard]] std::span<const NodeIndex> elements(const Node& list) const noexcept {
    return children_.span(list.payload, list.count);
  }
  [[nodiscard]] std::span<const NodeIndex> keys(const Node& dictionary) const noexcept {
    return children_.span(dictionary.payload, dictionary.count);
  }
  [[nodiscard]] std::span<const NodeIndex> values(const Node& dictionary) const noexcept {
    return children_.span(dictionary.payload + dictionary.count, dictionary.count);
  }

  /// Which threads may use what is decoded from the document.
  [[nodiscard]] Sharing sharing() const noexcept {
    return source_ ? source_->sharing() : Sharing::anyThread;
  }

  /// The bytes of a string or data node; valid as long as the document. kReadable bytes can be
  /// read from the beginning of any.
  [[nodiscard]] std::string_view text(const Node& node) const noexcept {
    const Block* block = (node.transformed ? side_ : source_).get();
    return {block == nullptr ? kNothing : block->bytes() + node.payload, node.count};
  }
  /// The same as an owning slice, which outlives the document.
  [[nodiscard]] detail::Slice slice(const Node& node) const noexcept {
    return {(node.transformed ? side_ : source_).get(), static_cast<std::uint32_t>(node.payload),
            node.count};
  }
  /// As many references to the source block as a record has values, for `cell`.
  [[nodiscard]] References references(std::size_t count) const noexcept {
    return {source_.get(), count};
  }
  /// The same as `slice`, or the value of an integer or boolean node, for a sparse record. Each
  /// value of the source block takes over one of `references`, even a number, so that no branch
  /// depends on what the values are.
  [[nodiscard]] detail::Cell cell(const Node& node, References& references) const noexcept {
    const bool text = node.kind == Kind::string || node.kind == Kind::data;
    if (text && node.count == 0) [[unlikely]]
      return detail::Cell::emptyText();
    if (node.transformed) {
      side_->retain();
    } else {
      references.takeOne();
    }
    // The offset of a text fits in the lower half; the count of a number is 0.
    return {(node.transformed ? side_ : source_).get(),
            node.payload | std::uint64_t{node.count} << 32};
  }

 private:
  friend class BinaryReader;
  friend class DocumentBuilder;

  // Inline capacity for a message of about 40 fields, which then needs no allocation.
  using Nodes = ScratchArray<Node, 96>;
  using Children = ScratchArray<NodeIndex, 160>;

  Nodes nodes_;
  Children children_;
  static constexpr char kNothing[kReadable] = {};
  NodeIndex root_ = 0;
  BlockRef source_;
  BlockRef side_;
};

}  // namespace ironmoat::plist
