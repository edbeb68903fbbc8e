#pragma once

#include <optional>
#include <string_view>

#include "plist/xml_scanner.h"
#include "values/block_builder.h"

namespace ironmoat::plist {

// All are false when they have rejected the message (see XmlSource).

/// Moves on to a '<', '&' or CR, or to the end.
[[nodiscard]] bool skipCharacterData(XmlScanner& in);

/// Appends the content of a text element as it is to be read, from `start` to its end tag, with
/// references and CDATA resolved, line ends folded, comments and instructions left out.
[[nodiscard]] bool transformText(XmlScanner& in, const char* start, BlockBuilder& out);

/// Moves over the content of a text element, to its end tag. Where the message has that content
/// literally it is `literal`; otherwise that is none, and it is appended to `out`.
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
