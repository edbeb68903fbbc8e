#include "plist/xml_text.h"

#include <cstdint>

#include "values/utf8.h"

namespace ironmoat::plist {

namespace {

void appendFoldingLineEnds(std::string_view text, BlockBuilder& out) {
  for (;;) {
    const std::size_t plain = text.find('\r');
    out.append(text.substr(0, plain));
    if (plain == std::string_view::npos) return;
    out.push('\n');
    text.remove_prefix(text.substr(plain).starts_with("\r\n") ? plain + 2 : plain + 1);
  }
}

/// Takes the number after "&#".
[[nodiscard]] bool takeCharacterNumber(XmlScanner& in, char32_t& character) {
  const std::uint32_t base = in.take("x") ? 16 : 10;
  std::uint32_t number = 0;
  bool any = false;
  for (;; in.advance(1), any = true) {
    const auto c = static_cast<unsigned char>(in.peek());
    const auto letter = static_cast<std::uint32_t>((c | 0x20) - 'a');
    std::uint32_t digit = base;
    if (c >= '0' && c <= '9')
      digit = c - std::uint32_t{'0'};
    else if (letter < 6)
      digit = letter + 10;
    if (digit >= base) break;
    if (number <= 0x10FFFF) number = number * base + digit;  // a larger number stays larger
  }
  character = number;
  return any || in.reject("not a valid character reference");
}

[[nodiscard]] bool takeReference(XmlScanner& in, BlockBuilder& out) {
  const auto standsFor = [&out](char c) {
    out.push(c);
    return true;
  };
  const char* start = in.at();
  if (in.take("&lt;")) return standsFor('<');
  if (in.take("&gt;")) return standsFor('>');
  if (in.take("&amp;")) return standsFor('&');
  if (in.take("&quot;")) return standsFor('"');
  if (in.take("&apos;")) return standsFor('\'');
  if (!in.take("&#")) return in.reject("not a valid entity");
  char32_t character = 0;
  if (!takeCharacterNumber(in, character)) return false;
  if (!in.take(";")) return in.reject("not a valid character reference");
  if (!isXmlCharacter(character)) return in.reject("not a valid XML character", start);
  char utf8[4];
  out.append({utf8, writeUtf8(character, utf8)});
  return true;
}

}  // namespace

bool skipCharacterData(XmlScanner& in) {
  for (in.skipPlainText(); in.peek() == ']'; in.skipPlainText()) {
    if (in.looksAt("]]>")) return in.reject("unexpected end of CDATA");
    in.advance(1);
  }
  return true;
}

bool transformText(XmlScanner& in, const char* start, BlockBuilder& out) {
  const char* literal = start;  // not yet appended
  for (;;) {
    out.append({literal, static_cast<std::size_t>(in.at() - literal)});
    if (in.take("\r")) {
      in.take("\n");
      out.push('\n');
    } else if (in.peek() == '&') {
      if (!takeReference(in, out)) return false;
    } else if (in.take("<![CDATA[")) {
      std::string_view content;
      if (!in.takeUntil("]]>", content)) return false;
      appendFoldingLineEnds(content, out);
    } else if (in.looksAt("</")) {
      return true;
    } else if (!in.looksAtMarkup()) {
      return in.reject("unexpected element inside a text element");
    } else if (!in.skipMarkup()) {
      return false;
    }
    literal = in.at();
    if (!skipCharacterData(in)) return false;
  }
}

}  // namespace ironmoat::plist
