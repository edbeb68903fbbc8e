#pragma once

#include <optional>
#include <string_view>

#include "plist/xml_scanner.h"
#include "values/block_builder.h"

namespace ironmoat::plist {

// All functions return false when they reject the message (see XmlSource).

/// Moves to the next '<', '&' or CR, or to the end.
[[nodiscard]] bool skipCharacterData(XmlScanner& in);

/// Appends the value of a text element, from `start` to its end tag: references and CDATA are
/// resolved, line ends become LF, comments and processing instructions are left out.
[[nodiscard]] bool transformText(XmlScanner& in, const char* start, BlockBuilder& out);

/// Takes the value of a text element and moves to its end tag. A value that the message has
/// literally is returned in `literal`; any other is appended to `out`, and `literal` is empty.
[[nodiscard]] inline bool takeText(XmlScanner& in, std::optional<std::string_view>& literal,
                                   BlockBuilder& out) {
  const char* const start = in.at();
  in.skipPlainText();
  if (in.peek() == ']' && !skipCharacterData(in)) return false;
  if (!in.looksAt("</")) {
    literal.reset();
    return transformText(in, start, out);
  }
  literal.emplace(start, static_cast<std::size_t>(in.at() - start));
  return true;
}

}  // namespace ironmoat::plist
