#include "plist/xml_scanner.h"

#include <algorithm>

namespace ironmoat::plist {

namespace {

bool isOneDotDigits(std::string_view version) noexcept {
  return version.size() > 2 && version.starts_with("1.") &&
         std::all_of(version.begin() + 2, version.end(),
                     [](char c) { return c >= '0' && c <= '9'; });
}

bool isXmlInAnyCase(std::string_view name) noexcept {
  return name.size() == 3 && (name[0] | 0x20) == 'x' && (name[1] | 0x20) == 'm' &&
         (name[2] | 0x20) == 'l';
}

}  // namespace

bool XmlScanner::takeUntil(std::string_view mark, std::string_view& text) {
  const std::string_view left = rest();
  const std::size_t length = left.find(mark);
  if (length == std::string_view::npos) return reject("unexpected end of message", end_);
  at_ += length + mark.size();
  text = left.substr(0, length);
  return true;
}

bool XmlScanner::takeQuoted(std::string_view& value) {
  if (take("\"")) return takeUntil("\"", value);
  if (take("'")) return takeUntil("'", value);
  return reject("missing quoted value");
}

bool XmlScanner::takeAttributeValue(std::string_view& value) {
  skipSpace();
  if (!take("=")) return reject("missing attribute value");
  skipSpace();
  if (!takeQuoted(value)) return false;
  const std::size_t wrong = value.find_first_of("<&");
  return wrong == std::string_view::npos ||
         reject("markup in an attribute value not allowed", value.data() + wrong);
}

bool XmlScanner::takeName(std::string_view& name) {
  name = rest().substr(0, xmlNameLength(rest()));
  at_ += name.size();
  return !name.empty() || reject("missing name");
}

bool XmlScanner::requireSpace() { return skipSpace() || reject("missing white space"); }

bool XmlScanner::skipProlog() {
  if (!declaration() || !skipMisc()) return false;
  if (take("<!DOCTYPE") && !doctype()) return false;
  return skipMisc();
}

bool XmlScanner::declaration() {
  // The declaration that nearly every writer emits is skipped in one step.
  constexpr std::string_view kUsual = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>";
  if (!source_.isUtf16() && rest().starts_with(kUsual)) {
    advance(kUsual.size());
    return true;
  }
  if (!looksAt("<?xml") || (rest().size() > 5 && !isXmlSpace(at_[5]))) return true;
  advance(5);
  skipSpace();
  if (!take("version")) return reject("missing version");
  std::string_view value;
  if (!takeAttributeValue(value)) return false;
  if (!isOneDotDigits(value)) return reject("not a valid XML version", value.data());
  bool spaced = skipSpace();
  if (spaced && take("encoding")) {
    if (!takeAttributeValue(value) || !source_.checkEncoding(value, value.data())) return false;
    spaced = skipSpace();
  }
  if (spaced && take("standalone")) {
    if (!takeAttributeValue(value)) return false;
    if (value != "yes" && value != "no")
      return reject("not a valid standalone value", value.data());
    skipSpace();
  }
  return take("?>") || reject("not a valid XML declaration");
}

bool XmlScanner::doctype() {
  std::string_view name;
  if (!requireSpace() || !takeName(name)) return false;
  const bool spaced = skipSpace();
  const bool isPublic = spaced && take("PUBLIC");
  if (isPublic || (spaced && take("SYSTEM"))) {
    if (!requireSpace()) return false;
    if (isPublic && (!publicIdentifier() || !requireSpace())) return false;
    std::string_view where;
    if (!takeQuoted(where)) return false;
    skipSpace();
  }
  if (peek() == '[') return reject("internal subset not allowed");
  return take(">") || reject("not a valid document type");
}

bool XmlScanner::publicIdentifier() {
  constexpr std::string_view kCharacters =
      " \r\nabcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789-'()+,./:=?;!*#@$_%";
  std::string_view identifier;
  if (!takeQuoted(identifier)) return false;
  const std::size_t wrong = identifier.find_first_not_of(kCharacters);
  return wrong == std::string_view::npos ||
         reject("not a valid character in a public identifier", identifier.data() + wrong);
}

bool XmlScanner::skipMisc() {
  for (skipSpace(); looksAtMarkup(); skipSpace()) {
    if (!skipMarkup()) return false;
  }
  return true;
}

bool XmlScanner::skipMarkup() {
  const char* start = at_;
  std::string_view text;
  if (take("<!--")) {
    if (!takeUntil("--", text)) return false;
    return take(">") || reject("two hyphens in a comment not allowed");
  }
  advance(2);
  if (!takeName(text)) return false;
  if (isXmlInAnyCase(text)) return reject("unexpected XML declaration", start);
  return take("?>") || (requireSpace() && takeUntil("?>", text));
}

}  // namespace ironmoat::plist
