#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>

#include "ironmoat/errors.h"
#include "ironmoat/limits.h"
#include "plist/document.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "require.h"
#include "support/rejection.h"
#include "support/show_document.h"

namespace ironmoat::fuzz {

/// The rejection of a reader as "kind: description"; nothing if it accepted the message.
template <class Read>
std::string rejectionOf(Read read, const Data& message, plist::Document& document) {
  const std::optional<DecodingError> rejection = read(message, document);
  if (!rejection) return {};
  require(rejection->path().empty());
  require(rejection->offset().value_or(0) <= message.size());
  require((rejection->kind() == DecodingError::Kind::malformed) == rejection->offset().has_value());
  return testing::inWords(*rejection);
}

/// Walks the tree of a document and trusts no index in it. Counts a shared node each time, up to
/// `most`.
struct Walk {
  const plist::Document& document;
  std::size_t most;
  std::size_t nodes = 0;
  std::size_t bytes = 0;
  bool writable = true;  ///< the writers can write all kinds in the tree

  [[nodiscard]] bool tooLarge() const { return nodes > most || bytes > 256 * most; }

  void visit(plist::NodeIndex index, std::uint32_t depth) {
    using plist::Kind;
    require(depth <= limits::nestedContainers);
    ++nodes;
    if (tooLarge()) return;
    const plist::Node& node = document.node(index);
    switch (node.kind) {
      case Kind::dictionary:
        for (const plist::NodeIndex key : document.keys(node)) {
          require(document.node(key).kind == Kind::string);
          visitChild(key, depth);
        }
        for (const plist::NodeIndex value : document.values(node)) visitChild(value, depth);
        return;
      case Kind::set:
        writable = false;
        [[fallthrough]];
      case Kind::array:
        for (const plist::NodeIndex element : document.elements(node)) visitChild(element, depth);
        return;
      case Kind::string:
      case Kind::data:
        requireInside(document.slice(node));
        bytes += node.count;
        return;
      case Kind::wideInteger:
      case Kind::real:
      case Kind::date:
      case Kind::uid:
      case Kind::null:
        writable = false;
        return;
      case Kind::integer:
      case Kind::boolean:
        return;
    }
  }
  static void requireInside(const detail::Slice& text) {
    require(text.block() == nullptr
                ? text.length() == 0
                : text.offset() + std::uint64_t{text.length()} <= text.block()->size());
  }
  void visitChild(plist::NodeIndex index, std::uint32_t depth) {
    const plist::Kind kind = document.node(index).kind;
    const bool container = kind < plist::Kind::string;
    if (!tooLarge()) visit(index, depth + (container ? 1 : 0));
  }
};
inline Walk walk(const plist::Document& document) {
  Walk walk{document, 5000};
  walk.visit(document.root(), 1);
  return walk;
}

/// Requires that the same bytes give the same outcome, and that the tree is equal after a round
/// trip through either format.
template <class Read>
void checkReading(Read read, const Data& message) {
  plist::Document document;
  plist::Document again;
  const std::string error = rejectionOf(read, message, document);
  require(rejectionOf(read, message, again) == error);
  if (!error.empty()) return;
  const Walk walked = walk(document);
  if (walked.tooLarge()) return;
  const std::string shown = show(document);
  require(show(again) == shown);
  if (!walked.writable) return;
  plist::Document fromBinary;
  require(!readBinary(writeBinary(document), fromBinary));
  require(show(fromBinary) == shown);
  try {
    plist::Document fromXml;
    require(!readXml(writeXml(document), fromXml));
    require(show(fromXml) == shown);
  } catch (const std::invalid_argument&) {
    require(read != plist::readXml);  // text that XML cannot hold
  }
}

}  // namespace ironmoat::fuzz
