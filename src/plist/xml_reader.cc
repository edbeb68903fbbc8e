#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "plist/base64.h"
#include "plist/document_builder.h"
#include "plist/reader.h"
#include "plist/rejection.h"
#include "plist/xml_scalars.h"
#include "plist/xml_scanner.h"
#include "plist/xml_text.h"

namespace ironmoat::plist {

namespace {

class XmlReader {
 public:
  XmlReader(XmlSource& source, Document& document)
      : source_(source),
        in_(source),
        builder_(document, source.block(), source.sharing()),
        scratch_(source.sharing()) {}

  // Like all functions here, returns false when it rejects the message (see XmlSource). Not
  // inlined, so that the compiler inlines the functions for an element into it instead.
  [[nodiscard, gnu::noinline]] bool read() {
    if (!in_.skipProlog() || !beginRoot()) return false;
    while (expected_ != Expected::after) {
      if (!takeNext()) return false;
    }
    if (!in_.skipMisc()) return false;
    if (!in_.atEnd()) return in_.reject("unexpected content after the plist");
    builder_.finish();
    return true;
  }

 private:
  /// What is expected next.
  enum class Expected { onlyValue, endOfRoot, element, key, value, after };

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

  [[nodiscard]] bool beginRoot();
  [[nodiscard]] bool takeNext();
  [[nodiscard]] bool takeElement(Element element, const char* start);
  [[nodiscard]] bool value(Element element, bool empty);
  [[nodiscard]] bool container(Element element, bool empty);
  [[nodiscard]] bool scalar(Element element, bool empty);
  Element takeElementName() noexcept;
  [[nodiscard]] bool endOfStartTag(bool& empty);
  template <std::size_t Size>
  [[nodiscard]] bool endTag(const char (&tag)[Size]);
  [[nodiscard]] bool spacedEndTag(std::string_view start);
  [[nodiscard]] bool endTagOfContainer();
  void endContainer();

  template <std::size_t Size>
  [[nodiscard]] bool string(bool empty, const char (&tag)[Size]);
  [[nodiscard]] bool data(bool empty);
  [[nodiscard]] bool scalarText(bool empty, std::string_view& text);

  XmlSource& source_;
  XmlScanner in_;
  DocumentBuilder builder_;
  BlockBuilder scratch_;  // text of scalars and data that is not literal
  Expected expected_ = Expected::onlyValue;
};

bool XmlReader::beginRoot() {
  constexpr std::string_view kUsual = "<plist version=\"1.0\">";
  if (in_.rest().starts_with(kUsual)) {
    in_.advance(kUsual.size());
    return true;
  }
  if (!in_.take("<plist")) return in_.reject("missing plist element");
  if (in_.skipSpace() && in_.take("version")) {
    std::string_view version;
    if (!in_.takeAttributeValue(version)) return false;
    in_.skipSpace();
  }
  if (in_.looksAt("/>")) return in_.reject("missing value in the plist");
  return in_.take(">") || in_.reject("not a valid plist tag");
}

bool XmlReader::takeNext() {
  in_.skipSpace();
  const char* const start = in_.at();
  const Element element = takeElementName();
  if (element != Element::unknown) return takeElement(element, start);
  if (in_.looksAt("</")) return endTagOfContainer();
  if (in_.looksAtMarkup()) return in_.skipMarkup();
  return in_.reject(in_.peek() == '<' ? "not a valid element"
                                      : "unexpected text outside a text element");
}

bool XmlReader::endTagOfContainer() {
  switch (expected_) {
    case Expected::onlyValue:
      return in_.reject("missing value in the plist");
    case Expected::value:
      return in_.reject("missing value after a key");
    case Expected::endOfRoot:
      if (!endTag("</plist>")) return false;
      expected_ = Expected::after;
      return true;
    case Expected::element:
      if (!endTag("</array>")) return false;
      break;
    case Expected::key:
      if (!endTag("</dict>")) return false;
      break;
    case Expected::after:
      break;
  }
  endContainer();
  return true;
}

void XmlReader::endContainer() {
  builder_.end();
  if (builder_.depth() == 0) {
    expected_ = Expected::endOfRoot;
  } else {
    expected_ = builder_.inDictionary() ? Expected::key : Expected::element;
  }
}

bool XmlReader::takeElement(Element element, const char* start) {
  bool empty = false;
  if (!endOfStartTag(empty)) return false;
  if (element == Element::key) {
    if (expected_ == Expected::value) return in_.reject("missing value after a key", start);
    if (expected_ != Expected::key) return in_.reject("unexpected key outside a dictionary", start);
    expected_ = Expected::value;
    return string(empty, "</key>");
  }
  if (expected_ == Expected::key) return in_.reject("missing key before a value", start);
  if (expected_ == Expected::endOfRoot)
    return in_.reject("unexpected second value in the plist", start);
  return value(element, empty);
}

bool XmlReader::value(Element element, bool empty) {
  if (expected_ == Expected::value) {
    expected_ = Expected::key;
  } else if (expected_ == Expected::onlyValue) {
    expected_ = Expected::endOfRoot;
  }
  switch (element) {
    case Element::dictionary:
    case Element::array:
      return container(element, empty);
    case Element::string:
      return string(empty, "</string>");
    case Element::data:
      return data(empty);
    case Element::integer:
    case Element::real:
    case Element::date:
      return scalar(element, empty);
    case Element::yes:
      builder_.boolean(true);
      return empty || endTag("</true>");
    case Element::no:
      builder_.boolean(false);
      return empty || endTag("</false>");
    case Element::key:
    case Element::unknown:
      break;  // not values
  }
  return true;
}

bool XmlReader::container(Element element, bool empty) {
  const bool dictionary = element == Element::dictionary;
  const bool begun = dictionary ? builder_.beginDictionary() : builder_.beginArray();
  if (!begun) return source_.reject(tooDeep());
  expected_ = dictionary ? Expected::key : Expected::element;
  if (empty) endContainer();
  return true;
}

bool XmlReader::scalar(Element element, bool empty) {
  const char* const content = in_.at();
  std::string_view text;
  if (!scalarText(empty, text)) return false;
  switch (element) {
    case Element::integer:
      if (!addInteger(text, builder_)) return in_.reject("not a valid integer", content);
      return empty || endTag("</integer>");
    case Element::real:
      if (!isReal(text)) return in_.reject("not a valid real", content);
      builder_.opaque(Kind::real);
      return empty || endTag("</real>");
    default:
      if (!isDate(text)) return in_.reject("not a valid date", content);
      builder_.opaque(Kind::date);
      return empty || endTag("</date>");
  }
}

/// Takes '<' and the name of an element; takes nothing if the name is unknown.
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

/// Takes the rest of a start tag. `empty`: whether it is an empty-element tag.
bool XmlReader::endOfStartTag(bool& empty) {
  if (in_.take(">")) return true;
  const char* const after = in_.at();
  in_.skipSpace();
  empty = in_.take("/>");
  if (empty || in_.take(">")) return true;
  return in_.reject(in_.at() == after ? "not a valid element" : "attribute not allowed");
}

template <std::size_t Size>
bool XmlReader::endTag(const char (&tag)[Size]) {
  return in_.take(tag) || spacedEndTag({tag, Size - 2});
}

/// Takes an end tag with white space before its '>'. `start` is the tag without the '>'.
bool XmlReader::spacedEndTag(std::string_view start) {
  if (!in_.rest().starts_with(start)) return in_.reject("missing end tag");
  in_.advance(start.size());
  in_.skipSpace();
  return in_.take(">") || in_.reject("missing end tag");
}

template <std::size_t Size>
bool XmlReader::string(bool empty, const char (&tag)[Size]) {
  if (empty) {
    builder_.sourceString(source_.offsetInBlock(in_.at()), 0);
    return true;
  }
  const std::size_t start = builder_.side().size();
  std::optional<std::string_view> literal;
  if (!takeText(in_, literal, builder_.side())) return false;
  if (literal) {
    builder_.sourceString(source_.offsetInBlock(literal->data()),
                          static_cast<std::uint32_t>(literal->size()));
  } else {
    builder_.sideValue(Kind::string, start);
  }
  return endTag(tag);
}

/// Takes the text of a scalar element. Valid until the next call.
bool XmlReader::scalarText(bool empty, std::string_view& text) {
  std::optional<std::string_view> literal = std::string_view();
  scratch_.truncate(0);
  if (!empty && !takeText(in_, literal, scratch_)) return false;
  text = literal ? *literal : std::string_view(scratch_.bytes(), scratch_.size());
  return true;
}

bool XmlReader::data(bool empty) {
  BlockBuilder& side = builder_.side();
  const std::size_t start = side.size();
  if (!empty) {
    const std::string_view rest = in_.rest();
    const std::string_view plain = rest.substr(0, rest.find('<'));
    // More than the value needs, so that values after a large one do not move it.
    side.reserve(plain.size());
    const std::optional<std::size_t> wrong = decodeBase64(plain, side);
    const bool atEndTag = rest.substr(plain.size()).starts_with("</");
    if (atEndTag && !(wrong && rest[*wrong] == '&')) {
      if (wrong) return in_.reject("not a valid base64 text", rest.data() + *wrong);
      in_.advance(plain.size());
    } else {  // references or markup in it
      side.truncate(start);
      std::string_view text;
      if (!scalarText(false, text)) return false;
      if (decodeBase64(text, side)) return in_.reject("not a valid base64 text", rest.data());
    }
    if (!endTag("</data>")) return false;
  }
  builder_.sideValue(Kind::data, start);
  return true;
}

}  // namespace

std::optional<DecodingError> readXml(const Data& message, Document& document) {
  XmlSource source(message);
  if (source.open() && XmlReader(source, document).read()) return std::nullopt;
  return source.takeRejection();
}

}  // namespace ironmoat::plist
