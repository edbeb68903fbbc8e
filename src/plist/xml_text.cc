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

/// After "&#".
char32_t takeCharacterNumber(XmlScanner& in) {
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
    if (number <= 0x10FFFF) number = number * base + digit;  // past it, it stays past it
  }
  if (!any) in.refuse("bad reference");
  return number;
}

void takeReference(XmlScanner& in, BlockBuilder& out) {
  const char* start = in.at();
  if (in.take("&lt;")) return out.push('<');
  if (in.take("&gt;")) return out.push('>');
  if (in.take("&amp;")) return out.push('&');
  if (in.take("&quot;")) return out.push('"');
  if (in.take("&apos;")) return out.push('\'');
  if (!in.take("&#")) in.refuse("unknown entity");
  const char32_t character = takeCharacterNumber(in);
  if (!in.take(";")) in.refuse("bad reference");
  if (!isXmlCharacter(character)) in.refuse("no character of xml", start);
  char utf8[4];
  out.append({utf8, writeUtf8(character, utf8)});
}

}  // namespace

void skipCharacterData(XmlScanner& in) {
  for (in.skipPlainText(); in.peek() == ']'; in.skipPlainText()) {
    if (in.looksAt("]]>")) in.refuse("end of cdata outside of any");
    in.advance(1);
  }
}

void transformText(XmlScanner& in, const char* start, BlockBuilder& out) {
  const char* literal = start;  // what is to be appended as it is
  for (;;) {
    out.append({literal, static_cast<std::size_t>(in.at() - literal)});
    if (in.take("\r")) {
      in.take("\n");
      out.push('\n');
    } else if (in.peek() == '&') {
      takeReference(in, out);
    } else if (in.take("<![CDATA[")) {
      appendFoldingLineEnds(in.takeUntil("]]>"), out);
    } else if (in.looksAt("</")) {
      return;
    } else if (!in.skipMarkup()) {
      in.refuse("element inside a text element");
    }
    literal = in.at();
    skipCharacterData(in);
  }
}

}  // namespace ironmoat::plist
