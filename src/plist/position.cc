#include "plist/position.h"

#include <algorithm>
#include <cstddef>
#include <span>
#include <string_view>

#include "plist/binary_format.h"
#include "plist/xml_scanner.h"
#include "plist/xml_source.h"

namespace ironmoat::plist {

namespace {

std::uint64_t bigEndian(std::span<const std::uint8_t> bytes) noexcept {
  std::uint64_t value = 0;
  for (const std::uint8_t byte : bytes) value = value << 8 | byte;
  return value;
}

/// A node has the place in the document that its object has in the table. All sizes and offsets
/// were proven when the message was read.
std::uint64_t positionInBinary(NodeIndex node, std::span<const std::uint8_t> message) {
  const auto trailer = message.last(binary::kTrailerSize);
  const std::size_t offsetSize = trailer[6];
  const std::uint64_t table = bigEndian(trailer.last(8));
  return bigEndian(message.subspan(table + node * offsetSize, offsetSize));
}

/// Every element but the root's own is one node, in the order of the start tags; what else has a
/// '<' is markup that is skipped: no attribute has.
std::uint64_t positionInXml(NodeIndex node, const Data& message) {
  XmlSource source(message);  // rejects nothing: it was read before
  if (!source.open(XmlSource::Characters::known)) return 0;
  XmlScanner in(source);
  if (!in.skipProlog()) return 0;
  in.take("<plist");
  std::string_view content;
  while (!in.atEnd()) {
    in.advance(std::min(in.rest().find('<'), in.rest().size()));
    const char next = in.peek(1);
    if (next == '!' || next == '?') {
      if (!(in.take("<![CDATA[") ? in.takeUntil("]]>", content) : in.skipMarkup())) break;
    } else {
      if (in.atEnd() || (next != '/' && node-- == 0)) break;
      in.advance(1);
    }
  }
  return source.offsetInMessage(in.at());
}

}  // namespace

std::uint64_t positionOf(NodeIndex node, const Data& message) {
  if (message.view().starts_with("bplist")) return positionInBinary(node, message.bytes());
  return positionInXml(node, message);
}

}  // namespace ironmoat::plist
