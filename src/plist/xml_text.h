#pragma once

#include <string_view>

#include "plist/xml_scanner.h"
#include "values/block_builder.h"

namespace ironmoat::plist {

/// Moves on to a '<', '&' or CR, or to the end.
void skipCharacterData(XmlScanner& in);

/// Appends the content of a text element as it is to be read, from `start` to its end tag, with
/// references and CDATA resolved, line ends folded, comments and instructions left out.
void transformText(XmlScanner& in, const char* start, BlockBuilder& out);

/// Moves over the content of a text element, to its end tag. Returns true when the message has that
/// content literally, in `literal`; otherwise it is appended to `out`.
[[nodiscard]] inline bool takeText(XmlScanner& in, std::string_view& literal, BlockBuilder& out) {
  const char* const start = in.at();
  in.skipPlainText();
  if (in.peek() == ']') skipCharacterData(in);
  if (!in.looksAt("</")) {
    transformText(in, start, out);
    return false;
  }
  literal = {start, static_cast<std::size_t>(in.at() - start)};
  return true;
}

}  // namespace ironmoat::plist
