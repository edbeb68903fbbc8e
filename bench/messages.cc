#include "messages.h"

#include <algorithm>
#include <stdexcept>

#include "filler.h"

namespace ironmoat::bench {

namespace {

Data data(std::size_t size, std::uint64_t number) { return Data(noise(size, number)); }

VeskCorvelProtocolPayload unicodePayload() {
  VeskCorvelProtocolPayload record = typicalPayload(0);
  record.messageId = String("сообщение-七八九-ᚠᛇᚻ-٤٥٦");
  record.userAgent = String("агент/семнадцать (устройство 十四, 北京)");
  record.contentType = String("текст/простой");
  record.senderId = String("отправитель：佐藤さくら@例え.テスト");
  record.destinationId = String("получатель：יעל כהן@דוגמה.בדיקה");
  record.encryptionType = String("пара-公開鍵");
  record.payload =
      Data(std::string_view("Привет! 今日はとても良い天気ですね。 שלום עולם 😀 Καλημέρα"));
  return record;
}

std::vector<Sample> makeSamples() {
  VeskCorvelProtocolPayload min;
  min.command = 96;
  VeskCorvelProtocolPayload full;
  Filler().fill(full);
  VeskCorvelProtocolPayload fanout = typicalPayload(0);
  List<VeskCorvelProtocolPayload> nested;
  for (unsigned i = 1; i <= 500; ++i) nested.push_back(typicalPayload(i));
  fanout.dstIdTokenList = std::move(nested);
  VeskCorvelProtocolPayload blob = typicalPayload(0);
  blob.payload = data(std::size_t{1} << 20, 0);
  return {{"min", min},   {"typical", typicalPayload(0)}, {"full", full}, {"fanout", fanout},
          {"blob", blob}, {"unicode", unicodePayload()}};
}

}  // namespace

std::string noise(std::size_t size, std::uint64_t number) {
  std::string bytes;
  std::uint64_t state = number * 2654435761U + 88172645463325252U;
  while (bytes.size() < size) {
    state ^= state << 13;
    state ^= state >> 7;
    state ^= state << 17;
    bytes.push_back(static_cast<char>(state >> 32));
  }
  return bytes;
}

std::string hex(std::size_t digits, std::uint64_t number) {
  std::string text;
  for (const char byte : noise(digits, number)) text += "0123456789abcdef"[byte & 15];
  return text;
}

VeskCorvelProtocolPayload typicalPayload(unsigned number) {
  VeskCorvelProtocolPayload record;
  record.command = 100;
  record.version = 8;
  record.payload = data(120, 10 * number);
  record.messageId = String(hex(16, 10 * number + 1));
  record.messageUUID = data(16, 10 * number + 2);
  record.generateDeliveryReceipt = true;
  record.destinationId = String("mailto:user" + std::to_string(number) + "@destination.example");
  record.userAgent = String("[os,17.4,build" + std::to_string(number) + ",device14,2]");
  record.token = data(32, 10 * number + 3);
  record.senderId = String("mailto:sender" + std::to_string(number) + "@origin.example");
  record.epochTimeNanos = 1732309874123456789 + number;
  record.encryptionType = String("pair-" + std::to_string(number));
  record.storageFlags = 5;
  record.priority = 10;
  record.dateExpirationSeconds = 1732914674 + number;
  record.contentType = String("text/x-message" + std::to_string(number));
  return record;
}

const std::vector<Sample>& samples() {
  static const std::vector<Sample> all = makeSamples();
  return all;
}

const Sample& sample(std::string_view name) {
  for (const Sample& each : samples()) {
    if (each.name == name) return each;
  }
  throw std::invalid_argument("no such sample");
}

std::string asOrdinaryWriters(std::string_view xml) {
  constexpr std::string_view kStart = "<data>";
  constexpr std::size_t kWidth = 76;
  constexpr std::size_t kTab = 8;
  std::string out;
  const auto takeUntil = [&](std::string_view mark) {
    const std::size_t length = std::min(xml.find(mark), xml.size());
    const std::string_view text = xml.substr(0, length);
    xml.remove_prefix(length);
    return text;
  };
  out += takeUntil("<plist");
  out += "<!DOCTYPE plist SYSTEM \"plist.dtd\">\n";
  for (;;) {
    out += takeUntil(kStart);
    if (xml.empty()) return out;
    xml.remove_prefix(kStart.size());
    const std::size_t indent = out.size() - 1 - out.rfind('\n');
    std::string newLine(1 + indent, '\t');
    newLine[0] = '\n';
    const std::size_t width = std::max<std::size_t>(16, kWidth - std::min(kWidth, kTab * indent));
    std::string_view base64 = takeUntil("<");
    out += kStart;
    for (; !base64.empty(); base64.remove_prefix(std::min(width / 4 * 4, base64.size()))) {
      out += newLine;
      out += base64.substr(0, width / 4 * 4);
    }
    out += newLine;
  }
}

Data inOneThreadBlock(std::string_view bytes) {
  return Data(detail::Slice::copyOf(bytes, Sharing::oneThread));
}

Data brokenAtLast(const Data& message, plist::Format form) {
  std::string bytes(message.view());
  if (form == plist::Format::xml) {
    bytes.at(bytes.rfind('>') - 1) = '-';
  } else {
    constexpr std::size_t kTrailer =
        32;  // bytes; byte 6 is the size of an offset in the table before it
    const std::size_t trailer = bytes.size() - kTrailer;
    bytes.at(trailer - static_cast<unsigned char>(bytes.at(trailer + 6))) = '\xFF';
  }
  return inOneThreadBlock(bytes);
}

}  // namespace ironmoat::bench
