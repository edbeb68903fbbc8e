#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "plist/base64.h"
#include "plist/document_builder.h"
#include "plist/reader.h"
#include "plist/refusal.h"
#include "plist/xml_scalars.h"
#include "plist/xml_scanner.h"
#include "plist/xml_text.h"

namespace ironmoat::plist {

namespace {

class XmlReader {
 public:
  XmlReader(const Data& message, Document& document)
      : source_(message),
        in_(source_),
        builder_(document, source_.block(), source_.sharing()),
        scratch_(source_.sharing()) {}

  void read() {
    in_.skipProlog();
    beginRoot();
    while (place_ != Place::after) {
      in_.skipSpace();
      const char* const start = in_.at();
      const Element element = takeElementName();
      if (element != Element::unknown) {
        takeElement(element, start);
      } else if (in_.looksAt("</")) {
        endTagOfContainer();
      } else if (!in_.skipMarkup()) {
        in_.refuse(in_.peek() == '<' ? "unknown element" : "text outside a text element");
      }
    }
    in_.skipMisc();
    if (!in_.atEnd()) in_.refuse("something after the plist");
    builder_.finish();
  }

 private:
  /// What may come next.
  enum class Place { onlyValue, endOfRoot, element, key, value, after };

  enum class Element {
    unknown,
    dictionary,
    array,
    key,
    string,
    data,
    integer,
    real,
    date,
    yes,
    no,
  };

  void beginRoot();
  void takeElement(Element element, const char* start);
  void value(Element element, bool empty);
  Element takeElementName() noexcept;
  bool endOfStartTag();
  template <std::size_t Size>
  void endTag(const char (&tag)[Size]);
  void spacedEndTag(std::string_view start);
  void endTagOfContainer();
  void endContainer();

  template <std::size_t Size>
  void string(bool empty, const char (&tag)[Size]);
  void data(bool empty);
  std::string_view scalarText(bool empty);

  XmlSource source_;
  XmlScanner in_;
  DocumentBuilder builder_;
  BlockBuilder scratch_;  // text of a scalar or of data that is not literal
  Place place_ = Place::onlyValue;
};

void XmlReader::beginRoot() {
  constexpr std::string_view kUsual = "<plist version=\"1.0\">";
  if (in_.rest().starts_with(kUsual)) return in_.advance(kUsual.size());
  if (!in_.take("<plist")) in_.refuse("no plist element");
  if (in_.skipSpace() && in_.take("version")) {
    in_.takeAttributeValue();
    in_.skipSpace();
  }
  if (in_.looksAt("/>")) in_.refuse("plist without a value");
  if (!in_.take(">")) in_.refuse("bad plist tag");
}

void XmlReader::endTagOfContainer() {
  switch (place_) {
    case Place::onlyValue:
      in_.refuse("plist without a value");
    case Place::value:
      in_.refuse("key without a value");
    case Place::endOfRoot:
      endTag("</plist>");
      place_ = Place::after;
      return;
    case Place::element:
      endTag("</array>");
      break;
    case Place::key:
      endTag("</dict>");
      break;
    case Place::after:
      break;
  }
  endContainer();
}

void XmlReader::endContainer() {
  builder_.end();
  if (builder_.depth() == 0) {
    place_ = Place::endOfRoot;
  } else {
    place_ = builder_.inDictionary() ? Place::key : Place::element;
  }
}

void XmlReader::takeElement(Element element, const char* start) {
  const bool empty = endOfStartTag();
  if (element == Element::key) {
    if (place_ == Place::value) in_.refuse("key without a value", start);
    if (place_ != Place::key) in_.refuse("key outside a dictionary", start);
    string(empty, "</key>");
    place_ = Place::value;
    return;
  }
  if (place_ == Place::key) in_.refuse("value without a key", start);
  if (place_ == Place::endOfRoot) in_.refuse("more than one value", start);
  value(element, empty);
}

void XmlReader::value(Element element, bool empty) {
  const char* const content = in_.at();
  switch (element) {
    case Element::dictionary:
      if (!builder_.beginDictionary()) throw tooDeep();
      place_ = Place::key;
      if (empty) endContainer();
      return;
    case Element::array:
      if (!builder_.beginArray()) throw tooDeep();
      place_ = Place::element;
      if (empty) endContainer();
      return;
    case Element::string:
      string(empty, "</string>");
      break;
    case Element::data:
      data(empty);
      break;
    case Element::integer:
      if (!addInteger(scalarText(empty), builder_)) in_.refuse("no integer", content);
      if (!empty) endTag("</integer>");
      break;
    case Element::real:
      if (!isReal(scalarText(empty))) in_.refuse("no real", content);
      if (!empty) endTag("</real>");
      builder_.opaque(Kind::real);
      break;
    case Element::date:
      if (!isDate(scalarText(empty))) in_.refuse("no date", content);
      if (!empty) endTag("</date>");
      builder_.opaque(Kind::date);
      break;
    case Element::yes:
      if (!empty) endTag("</true>");
      builder_.boolean(true);
      break;
    case Element::no:
      if (!empty) endTag("</false>");
      builder_.boolean(false);
      break;
    case Element::key:
    case Element::unknown:
      break;  // no values
  }
  if (place_ == Place::value) {
    place_ = Place::key;
  } else if (place_ == Place::onlyValue) {
    place_ = Place::endOfRoot;
  }
}

/// Moves past '<' and an element's name, if it is one.
XmlReader::Element XmlReader::takeElementName() noexcept {
  switch (in_.peek(1)) {
    case 'a':
      return in_.take("<array") ? Element::array : Element::unknown;
    case 'd':
      if (in_.take("<dict")) return Element::dictionary;
      if (in_.take("<data")) return Element::data;
      return in_.take("<date") ? Element::date : Element::unknown;
    case 'f':
      return in_.take("<false") ? Element::no : Element::unknown;
    case 'i':
      return in_.take("<integer") ? Element::integer : Element::unknown;
    case 'k':
      return in_.take("<key") ? Element::key : Element::unknown;
    case 'r':
      return in_.take("<real") ? Element::real : Element::unknown;
    case 's':
      return in_.take("<string") ? Element::string : Element::unknown;
    case 't':
      return in_.take("<true") ? Element::yes : Element::unknown;
    default:
      return Element::unknown;
  }
}

/// After an element's name; whether the element ends here, too.
bool XmlReader::endOfStartTag() {
  if (in_.take(">")) return false;
  const char* const after = in_.at();
  in_.skipSpace();
  if (in_.take("/>")) return true;
  if (in_.take(">")) return false;
  in_.refuse(in_.at() == after ? "unknown element" : "attribute");
}

template <std::size_t Size>
void XmlReader::endTag(const char (&tag)[Size]) {
  if (!in_.take(tag)) spacedEndTag({tag, Size - 2});
}

/// `start` is the tag without its '>'.
void XmlReader::spacedEndTag(std::string_view start) {
  if (!in_.rest().starts_with(start)) in_.refuse("wrong end tag");
  in_.advance(start.size());
  in_.skipSpace();
  if (!in_.take(">")) in_.refuse("wrong end tag");
}

template <std::size_t Size>
void XmlReader::string(bool empty, const char (&tag)[Size]) {
  const std::size_t start = builder_.side().size();
  std::string_view literal = in_.rest().substr(0, 0);
  if (empty || takeText(in_, literal, builder_.side())) {
    builder_.sourceString(source_.offsetInBlock(literal.data()),
                          static_cast<std::uint32_t>(literal.size()));
  } else {
    builder_.sideValue(Kind::string, start);
  }
  if (!empty) endTag(tag);
}

/// The text of an element that ends with its start tag, or up to its end tag. Valid until the next.
std::string_view XmlReader::scalarText(bool empty) {
  std::string_view text;
  scratch_.truncate(0);
  if (empty || takeText(in_, text, scratch_) || scratch_.size() == 0) return text;
  return {scratch_.bytes(), scratch_.size()};
}

void XmlReader::data(bool empty) {
  BlockBuilder& side = builder_.side();
  const std::size_t start = side.size();
  if (!empty) {
    const std::string_view rest = in_.rest();
    const std::string_view plain = rest.substr(0, rest.find('<'));
    // A third more than it takes: what comes after a large value does not move it (a tenth).
    side.reserve(plain.size());
    const std::optional<std::size_t> wrong = decodeBase64(plain, side);
    const bool atEndTag = rest.substr(plain.size()).starts_with("</");
    if (atEndTag && !(wrong && rest[*wrong] == '&')) {
      if (wrong) in_.refuse("no base64", rest.data() + *wrong);
      in_.advance(plain.size());
    } else {  // references or markup in it
      side.truncate(start);
      if (decodeBase64(scalarText(false), side)) in_.refuse("no base64", rest.data());
    }
    endTag("</data>");
  }
  builder_.sideValue(Kind::data, start);
}

}  // namespace

std::optional<DecodingError> readXml(const Data& message, Document& document) {
  try {
    XmlReader(message, document).read();
    return std::nullopt;
  } catch (const DecodingError& refusal) {
    return refusal;
  }
}

}  // namespace ironmoat::plist
