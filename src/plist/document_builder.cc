#include "plist/document_builder.h"

#include "ironmoat/limits.h"

namespace ironmoat::plist {

bool DocumentBuilder::begin(Kind kind) {
  if (open_.size() == limits::nestedContainers) return false;
  const auto index = static_cast<NodeIndex>(document_.nodes_.size());
  add({kind, false, 0, 0, 0});
  open_.push({index, static_cast<std::uint32_t>(pending_.size())});
  return true;
}

void DocumentBuilder::end() {
  const Open closed = open_.back();
  open_.shrinkTo(open_.size() - 1);
  const std::size_t children = pending_.size() - closed.firstPending;
  Node& node = document_.nodes_[closed.node];
  node.payload = document_.children_.size();
  NodeIndex* place = document_.children_.extend(children);
  if (node.kind == Kind::dictionary) {
    const std::size_t entries = children / 2;
    node.count = static_cast<std::uint32_t>(entries);
    for (std::size_t i = 0; i < entries; ++i) {
      place[i] = pending_[closed.firstPending + 2 * i];
      place[entries + i] = pending_[closed.firstPending + 2 * i + 1];
    }
  } else {
    node.count = static_cast<std::uint32_t>(children);
    for (std::size_t i = 0; i < children; ++i) place[i] = pending_[closed.firstPending + i];
  }
  pending_.shrinkTo(closed.firstPending);
}

}  // namespace ironmoat::plist
