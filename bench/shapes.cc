#include "shapes.h"

#include <algorithm>
#include <string>

#include "ironmoat/limits.h"
#include "messages.h"
#include "plist/document_builder.h"
#include "plist/writer.h"
#include "support/binary_builder.h"
#include "values/utf8.h"

namespace ironmoat::bench {

namespace {

using Payload = VeskCorvelProtocolPayload;

/// Bytes of content of each nested payload. With fewer, a message of 16 MiB would exceed
/// limits::recordBytes.
Payload heavyPayload(std::size_t number) {
  Payload payload;
  payload.command = static_cast<Int>(number);
  payload.payload = Data(std::string(800, static_cast<char>('a' + number % 26)));
  return payload;
}

Data nested(plist::Format form, std::size_t count) {
  constexpr std::size_t kDepth = 200;  // payloads; each takes two containers of nestedContainers
  Payload top;
  List<Payload> chains;
  while (count > 0) {
    Payload chain = heavyPayload(count);
    for (std::size_t depth = std::min(count, kDepth); depth > 1; --depth) {
      Payload outer = heavyPayload(depth);
      List<Payload> inner;
      inner.push_back(std::move(chain));
      outer.dstIdTokenList = std::move(inner);
      chain = std::move(outer);
    }
    chains.push_back(std::move(chain));
    count -= std::min(count, kDepth);
  }
  top.corvelMessageList = std::move(chains);
  return messageOf(top, form);
}

Data wide(plist::Format form, std::size_t count) {
  Payload top;
  List<Payload> all;
  for (std::size_t i = 0; i < count; ++i) all.push_back(heavyPayload(i));
  top.dstIdTokenList = std::move(all);
  return messageOf(top, form);
}

Data blob(plist::Format form, std::size_t count) {
  Payload top;
  top.payload = Data(std::string(count, '\xA7'));
  return messageOf(top, form);
}

/// A dictionary of `count` integers under unknown keys. Written by hand, because no record encodes
/// to it.
template <class Key>
Data manyEntries(plist::Format form, std::size_t count, Key key) {
  plist::Document document;
  plist::DocumentBuilder builder(document, BlockRef(), Sharing::anyThread);
  static_cast<void>(builder.beginDictionary());
  builder.string("c");
  builder.integer(1);
  for (std::size_t i = 0; i < count; ++i) {
    builder.string(key(i));
    builder.integer(static_cast<std::int64_t>(i));
  }
  builder.end();
  builder.finish();
  const Data bytes =
      form == plist::Format::binary ? plist::writeBinary(document) : plist::writeXml(document);
  return inOneThreadBlock(bytes.view());
}

template <class Text>
Payload texts(std::size_t count, Text text) {
  Payload top;
  List<String> all;
  for (std::size_t i = 0; i < count; ++i) all.push_back(String(text(i)));
  top.KibbDownloadUrlList = std::move(all);
  return top;
}

std::string prose(std::size_t number) {
  std::string text = std::to_string(number);
  while (text.size() < 250) text += " lorem ipsum dolor sit amet";
  return text;
}

Data utf16(plist::Format form, std::size_t count) {
  const Payload top = texts(count, [](std::size_t i) {
    std::string text = std::to_string(i);
    for (int n = 0; n < 12; ++n) text += " сообщение 消息 😀";
    return text;
  });
  if (form == plist::Format::binary) return messageOf(top, form);
  std::string text(messageOf(top, form).view());
  const std::size_t encoding = text.find("UTF-8");
  if (encoding != std::string::npos) text.replace(encoding, 5, "UTF-16");
  std::string bytes = "\xFE\xFF";
  for (const char16_t unit : utf16FromUtf8(text)) {
    bytes.push_back(static_cast<char>(unit >> 8));
    bytes.push_back(static_cast<char>(unit));
  }
  return inOneThreadBlock(bytes);
}

/// Arrays that share everything: two others refer to each array, and all refer to one text.
std::optional<Data> shared(plist::Format form, std::size_t count) {
  if (form == plist::Format::xml) return std::nullopt;
  constexpr std::size_t kGroup = 200;
  constexpr std::size_t kTexts = 40;
  testing::BinaryBuilder draft;
  draft.offsetSize = draft.referenceSize = 4;
  constexpr std::uint64_t kFirst = 5;
  const std::uint64_t text = kFirst + count;
  std::vector<std::uint64_t> roots;
  for (std::uint64_t root = kFirst; root < text; root += kGroup) roots.push_back(root);
  draft.dictionary({1, 2}, {3, 4}).ascii("c").ascii("unknown").integer(1).array(roots);
  for (std::uint64_t array = kFirst; array < text; ++array) {
    std::vector<std::uint64_t> elements(kTexts, text);
    const bool last = (array - kFirst) % kGroup == kGroup - 1 || array + 1 == text;
    if (!last) elements[0] = elements[kTexts / 2] = array + 1;
    draft.array(elements);
  }
  draft.ascii("shared by all");
  return inOneThreadBlock(draft.text());
}

Data tiny(plist::Format form, std::size_t count) {
  Payload top;
  List<VeskHoplineAllocationStatus> all(count);
  for (std::size_t i = 0; i < count; ++i) all[i].participantId = static_cast<Int64>(i);
  top.allocationStatuses = std::move(all);
  return messageOf(top, form);
}

std::string_view knownKey(std::size_t number) {
  static constexpr std::string_view kKeys[] = {"v", "s", "e", "pri", "fR", "cV", "rc", "qrp"};
  return kKeys[number % std::size(kKeys)];
}

}  // namespace

const std::vector<Shape>& shapes() {
  static const std::vector<Shape> all = {
      {"nested", 850, nested},
      {"wide", 850, wide},
      {"one blob", 1, blob},
      {"many keys", 8, [](auto form, auto count) { return manyEntries(form, count, knownKey); }},
      {"unknown keys", 26,
       [](auto form, auto count) {
         return manyEntries(
             form, count, [](auto i) { return std::string("unknown").append(std::to_string(i)); });
       }},
      {"text", 260, [](auto form, auto count) { return messageOf(texts(count, prose), form); }},
      {"UTF-16", 500, utf16},
      {"entities", 500,
       [](auto form, auto count) -> std::optional<Data> {
         if (form == plist::Format::binary) return std::nullopt;
         return messageOf(
             texts(count, [](auto i) { return std::string(100, '&').append(std::to_string(i)); }),
             form);
       }},
      {"shared", 165, shared},
      {"tiny records", 20, tiny},
  };
  return all;
}

std::optional<Data> messageOfSize(const Shape& shape, plist::Format form, std::size_t bytes) {
  std::size_t count = std::max<std::size_t>(bytes / shape.step, 1);
  std::optional<Data> message = shape.make(form, count);
  for (int round = 0; message && round < 4; ++round) {
    const double off = static_cast<double>(bytes) / static_cast<double>(message->size());
    if (off >= 1.0 && off < 1.05) break;
    const auto better = static_cast<std::size_t>(static_cast<double>(count) * off * 0.99);
    if (better == count || better == 0) break;
    count = better;
    message = shape.make(form, count);
  }
  if (message && message->size() > limits::messageBytes) message = shape.make(form, count * 9 / 10);
  return message;
}

}  // namespace ironmoat::bench
