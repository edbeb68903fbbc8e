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

std::string_view XmlScanner::takeUntil(std::string_view mark) {
  const std::string_view left = rest();
  const std::size_t length = left.find(mark);
  if (length == std::string_view::npos) refuse("unexpected end", end_);
  at_ += length + mark.size();
  return left.substr(0, length);
}

std::string_view XmlScanner::takeQuoted() {
  if (take("\"")) return takeUntil("\"");
  if (take("'")) return takeUntil("'");
  refuse("no quoted value");
}

std::string_view XmlScanner::takeAttributeValue() {
  skipSpace();
  if (!take("=")) refuse("attribute without a value");
  skipSpace();
  const std::string_view value = takeQuoted();
  const std::size_t wrong = value.find_first_of("<&");
  if (wrong != std::string_view::npos) refuse("markup in a value", value.data() + wrong);
  return value;
}

std::string_view XmlScanner::takeName() {
  const std::string_view name = rest().substr(0, xmlNameLength(rest()));
  if (name.empty()) refuse("no name");
  at_ += name.size();
  return name;
}

void XmlScanner::requireSpace() {
  if (!skipSpace()) refuse("no white space");
}

void XmlScanner::skipProlog() {
  declaration();
  skipMisc();
  if (take("<!DOCTYPE")) doctype();
  skipMisc();
}

void XmlScanner::declaration() {
  // As nearly every writer puts it, in one step: with the usual root tag, a third off reading the
  // smallest message.
  constexpr std::string_view kUsual = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>";
  if (!source_.isUtf16() && rest().starts_with(kUsual)) return advance(kUsual.size());
  if (!looksAt("<?xml") || (rest().size() > 5 && !isXmlSpace(at_[5]))) return;
  advance(5);
  requireSpace();
  if (!take("version")) refuse("no version");
  const std::string_view version = takeAttributeValue();
  if (!isOneDotDigits(version)) refuse("unknown version", version.data());
  bool spaced = skipSpace();
  if (spaced && take("encoding")) {
    const std::string_view encoding = takeAttributeValue();
    source_.checkEncoding(encoding, encoding.data());
    spaced = skipSpace();
  }
  if (spaced && take("standalone")) {
    const std::string_view standalone = takeAttributeValue();
    if (standalone != "yes" && standalone != "no") refuse("neither yes nor no", standalone.data());
    skipSpace();
  }
  if (!take("?>")) refuse("bad declaration");
}

void XmlScanner::doctype() {
  requireSpace();
  takeName();
  const bool spaced = skipSpace();
  const bool isPublic = spaced && take("PUBLIC");
  if (isPublic || (spaced && take("SYSTEM"))) {
    requireSpace();
    if (isPublic) {
      publicIdentifier();
      requireSpace();
    }
    takeQuoted();
    skipSpace();
  }
  if (peek() == '[') refuse("internal subset");
  if (!take(">")) refuse("bad document type");
}

void XmlScanner::publicIdentifier() {
  constexpr std::string_view kCharacters =
      " \r\nabcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789-'()+,./:=?;!*#@$_%";
  const std::string_view identifier = takeQuoted();
  const std::size_t wrong = identifier.find_first_not_of(kCharacters);
  if (wrong != std::string_view::npos) refuse("no public identifier", identifier.data() + wrong);
}

void XmlScanner::skipMisc() {
  do {
    skipSpace();
  } while (skipMarkup());
}

bool XmlScanner::skipMarkup() {
  const char* start = at_;
  if (take("<!--")) {
    takeUntil("--");
    if (!take(">")) refuse("two hyphens in a comment");
    return true;
  }
  if (!take("<?")) return false;
  if (isXmlInAnyCase(takeName())) refuse("misplaced declaration", start);
  if (!take("?>")) {
    requireSpace();
    takeUntil("?>");
  }
  return true;
}

}  // namespace ironmoat::plist
