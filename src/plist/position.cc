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

/// The index of a node is that of its object in the offset table. All sizes and offsets were
/// checked when the message was read.
std::uint64_t positionInBinary(NodeIndex node, std::span<const std::uint8_t> message) {
  const auto trailer = message.last(binary::kTrailerSize);
  const std::size_t offsetSize = trailer[6];
  const std::uint64_t table = bigEndian(trailer.last(8));
  return bigEndian(message.subspan(table + node * offsetSize, offsetSize));
}

/// Each element below the root element is one node, in the order of the start tags. Any other '<'
/// begins markup that is skipped; attributes have none.
std::uint64_t positionInXml(NodeIndex node, const Data& message) {
  XmlSource source(message);  // accepts the message, as the reader has
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
