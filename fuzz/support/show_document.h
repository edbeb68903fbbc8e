#pragma once

#include <string>
#include <string_view>

#include "plist/document.h"
#include "plist/reader.h"
#include "support/rejection.h"
#include "support/tight_message.h"

namespace ironmoat::plist {

/// Appends one value as `{"key": "text", "other": [1, true, data "bytes"]}`. Two documents with the
/// same text are equal. For tests and fuzz targets.
inline void show(const Document& document, NodeIndex index, std::string& out) {
  const Node& node = document.node(index);
  const auto showList = [&](char open, char close, auto&& showItem) {
    out += open;
    for (std::uint32_t i = 0; i < node.count; ++i) {
      if (i != 0) out += ", ";
      showItem(i);
    }
    out += close;
  };
  switch (node.kind) {
    case Kind::dictionary:
      return showList('{', '}', [&](std::uint32_t i) {
        show(document, document.keys(node)[i], out);
        out += ": ";
        show(document, document.values(node)[i], out);
      });
    case Kind::set:
      out += "set ";
      [[fallthrough]];
    case Kind::array:
      return showList('[', ']',
                      [&](std::uint32_t i) { show(document, document.elements(node)[i], out); });
    case Kind::data:
      out += "data ";
      [[fallthrough]];
    case Kind::string:
      out += '"';
      for (const char c : document.text(node)) {
        if (c == '"' || c == '\\') out += '\\';
        out += c;
      }
      out += '"';
      return;
    case Kind::integer:
      out += std::to_string(static_cast<std::int64_t>(node.payload));
      return;
    case Kind::boolean:
      out += node.payload != 0 ? "true" : "false";
      return;
    case Kind::wideInteger:
      out += "wide ";
      [[fallthrough]];
    default:
      out += nameOf(node.kind);
  }
}

inline std::string show(const Document& document) {
  std::string out;
  show(document, document.root(), out);
  return out;
}

/// The tree that a message holds, or its rejection as "kind: description".
inline std::string readOutcome(std::string_view message) {
  Document document;
  const auto rejection = read(testing::tightMessage(message), document);
  return rejection ? testing::inWords(*rejection) : show(document);
}

}  // namespace ironmoat::plist
