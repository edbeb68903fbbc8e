// Any bytes as the binary form: the same bytes always give the same tree or the same error, what is
// read is within its bounds, and a tree of kinds that are written comes back equal after it was.

#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "ironmoat/errors.h"
#include "ironmoat/limits.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "support/show_document.h"
#include "support/tight_message.h"

namespace {

using namespace ironmoat;
using namespace ironmoat::plist;

void require(bool holds) {
  if (!holds) std::abort();
}

/// Empty when the message was accepted.
std::string refusal(const Data& message, Document& document) {
  try {
    readBinary(message, document);
    return {};
  } catch (const DecodingError& error) {
    require(error.path().empty());
    require(error.offset().value_or(0) <= message.size());
    return error.what();
  }
}

/// Nodes of the tree that the document stands for, shared ones counted each time; stops past
/// `most`. Also whether only kinds that are written occur.
struct Walk {
  const Document& document;
  std::size_t most;
  std::size_t nodes = 0;
  bool writable = true;

  void visit(NodeIndex index, std::uint32_t depth) {
    require(depth <= limits::nestedContainers);
    if (++nodes > most) return;
    const Node& node = document.node(index);
    switch (node.kind) {
      case Kind::dictionary:
        for (const NodeIndex key : document.keys(node)) {
          require(document.node(key).kind == Kind::string);
        }
        for (const NodeIndex value : document.values(node)) visitChild(value, depth);
        return;
      case Kind::array:
        for (const NodeIndex element : document.elements(node)) visitChild(element, depth);
        return;
      case Kind::real:
      case Kind::date:
      case Kind::uid:
      case Kind::unsignedInteger:
        writable = false;
        return;
      default:
        return;
    }
  }
  void visitChild(NodeIndex index, std::uint32_t depth) {
    if (nodes <= most) visit(index, depth + 1);
  }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const Data message = testing::tightMessage({reinterpret_cast<const char*>(data), size});
  Document document;
  Document again;
  const std::string error = refusal(message, document);
  require(refusal(message, again) == error);
  if (!error.empty()) return 0;
  Walk walk{document, 5000};
  walk.visit(document.root(), 0);
  if (walk.nodes > walk.most) return 0;
  const std::string shown = show(document);
  require(show(again) == shown);
  if (!walk.writable) return 0;
  Document readBack;
  readBinary(writeBinary(document), readBack);
  require(show(readBack) == shown);
  return 0;
}
