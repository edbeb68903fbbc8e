#include <charconv>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>

#include "plist/base64.h"
#include "plist/writer.h"
#include "plist/xml_chars.h"
#include "values/block_builder.h"

namespace ironmoat::plist {

namespace {

/// The reference for a character that must be escaped, or nothing.
std::string_view escaped(char c) noexcept {
  switch (c) {
    case '&':
      return "&amp;";
    case '<':
      return "&lt;";
    case '>':
      return "&gt;";
    case '\r':
      return "&#13;";
    default:
      return {};
  }
}

class XmlWriter {
 public:
  explicit XmlWriter(const Document& document) : document_(document) {}

  Data write() {
    out_.append("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n");
    value(document_.root());
    while (!open_.empty()) step();
    out_.append("</plist>\n");
    const BlockRef block = out_.finish();
    return Data(detail::Slice(block.get(), 0, block->size()));
  }

 private:
  struct Open {
    NodeIndex node;
    std::uint32_t next;  // entry or element
  };

  /// Writes the next child of the innermost container, or its end tag.
  void step() {
    Open& open = open_.back();
    const Node& node = document_.node(open.node);
    const bool dictionary = node.kind == Kind::dictionary;
    if (open.next == node.count) {
      open_.shrinkTo(open_.size() - 1);
      line(dictionary ? "</dict>" : "</array>");
      return;
    }
    const std::uint32_t i = open.next++;
    if (!dictionary) return value(document_.elements(node)[i]);
    text("<key>", document_.node(document_.keys(node)[i]), "</key>\n");
    value(document_.values(node)[i]);
  }

  void value(NodeIndex index) {
    const Node& node = document_.node(index);
    switch (node.kind) {
      case Kind::dictionary:
        return container(index, node.count == 0 ? "<dict/>" : "<dict>");
      case Kind::array:
        return container(index, node.count == 0 ? "<array/>" : "<array>");
      case Kind::string:
        return text("<string>", node, "</string>\n");
      case Kind::data:
        indent();
        out_.append("<data>");
        encodeBase64(document_.text(node), out_);
        return out_.append("</data>\n");
      case Kind::integer:
        return integer(static_cast<std::int64_t>(node.payload));
      case Kind::boolean:
        return line(node.payload != 0 ? "<true/>" : "<false/>");
      case Kind::set:
      case Kind::wideInteger:
      case Kind::real:
      case Kind::date:
      case Kind::uid:
      case Kind::null:
        break;
    }
    throw std::invalid_argument("value kind not allowed: " + std::string(nameOf(node.kind)));
  }

  void container(NodeIndex index, std::string_view tag) {
    line(tag);
    if (document_.node(index).count != 0) open_.push({index, 0});
  }

  void integer(std::int64_t number) {
    char digits[20];
    const char* end = std::to_chars(digits, digits + sizeof digits, number).ptr;
    indent();
    out_.append("<integer>");
    out_.append({digits, static_cast<std::size_t>(end - digits)});
    out_.append("</integer>\n");
  }

  void text(std::string_view startTag, const Node& node, std::string_view endTag) {
    const std::string_view text = document_.text(node);
    if (xmlTextPrefix(text) != text.size()) {
      throw std::invalid_argument("not a valid XML character in a text");
    }
    indent();
    out_.append(startTag);
    std::size_t written = 0;
    for (std::size_t at = 0; at < text.size(); ++at) {
      const std::string_view replacement = escaped(text[at]);
      if (replacement.empty()) continue;
      out_.append(text.substr(written, at - written));
      out_.append(replacement);
      written = at + 1;
    }
    out_.append(text.substr(written));
    out_.append(endTag);
  }

  void line(std::string_view tag) {
    indent();
    out_.append(tag);
    out_.push('\n');
  }

  void indent() {
    for (std::size_t i = 0; i < open_.size(); ++i) out_.push('\t');
  }

  const Document& document_;
  BlockBuilder out_;
  ScratchArray<Open, 16> open_;
};

}  // namespace

Data writeXml(const Document& document) { return XmlWriter(document).write(); }

}  // namespace ironmoat::plist
