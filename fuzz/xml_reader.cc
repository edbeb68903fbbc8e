// Any bytes as XML: the same bytes always give the same tree or the same error, and a tree of kinds
// that are written comes back equal after it was.

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "ironmoat/errors.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "support/show_document.h"
#include "support/tight_message.h"

namespace {

using namespace ironmoat;
using namespace ironmoat::plist;

bool isWritable(const Document& document, NodeIndex index) {
  const Node& node = document.node(index);
  const auto writable = [&](NodeIndex child) { return isWritable(document, child); };
  switch (node.kind) {
    case Kind::dictionary:
      return std::ranges::all_of(document.values(node), writable);
    case Kind::array:
      return std::ranges::all_of(document.elements(node), writable);
    case Kind::string:
    case Kind::data:
    case Kind::integer:
    case Kind::boolean:
      return true;
    default:
      return false;
  }
}

void require(bool holds) {
  if (!holds) std::abort();
}

/// Empty when the message was accepted.
std::string refusal(const Data& message, Document& document) {
  try {
    readXml(message, document);
    return {};
  } catch (const DecodingError& error) {
    require(error.path().empty());
    require(error.offset().value_or(0) <= message.size());
    return error.what();
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const Data message = testing::tightMessage({reinterpret_cast<const char*>(data), size});
  Document document;
  Document again;
  const std::string error = refusal(message, document);
  require(refusal(message, again) == error);
  if (!error.empty()) return 0;
  const std::string shown = show(document);
  require(show(again) == shown);
  if (!isWritable(document, document.root())) return 0;
  Document readBack;
  readXml(writeXml(document), readBack);
  require(show(readBack) == shown);
  return 0;
}
