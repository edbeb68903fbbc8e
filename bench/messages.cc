#include "messages.h"

#include <cstdint>
#include <stdexcept>
#include <string>
#include <type_traits>

namespace ironmoat::bench {

namespace {

/// Bytes that look like a token's: the same ones for the same number, always.
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

/// Gives every field of a record a value, unlike any other field's.
class Filler {
 public:
  template <class R>
  void fill(R& record) {
    using Fields =
        typename std::remove_const_t<decltype(records::Table<R>::rows)>::template Fields<R>;
    Fields::forEach([&](auto field) { value(field.in(record)); });
  }

 private:
  template <class T>
  void value(Optional<T>& field) {
    T inner{};
    value(inner);
    field = Optional<T>(std::move(inner));
  }
  void value(Int& field) { field = static_cast<Int>(1000 * ++number_); }
  void value(Int64& field) { field = static_cast<Int64>(1732309874123456789 + ++number_); }
  void value(Bool& field) { field = (++number_ & 1) != 0; }
  void value(String& field) { field = String("text-" + hex(34, ++number_)); }
  void value(Data& field) { field = data(32, ++number_); }
  template <class T>
  void value(List<T>& field) {
    for (int i = 0; i < 3; ++i) value(field.emplace_back());
  }
  void value(List<VeskCorvelProtocolPayload>& field) {
    field.push_back(typicalPayload(static_cast<unsigned>(++number_)));
  }
  template <class R>
  requires requires { typename R::CodingKeys; }
  void value(R& field) { fill(field); }

  std::uint64_t number_ = 0;
};

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

Data inOneThreadBlock(std::string_view bytes) {
  return Data(detail::Slice::copyOf(bytes, Sharing::oneThread));
}

Data brokenAtLast(const Data& message, plist::Form form) {
  std::string bytes(message.view());
  if (form == plist::Form::xml) {
    bytes.at(bytes.rfind('>') - 1) = '-';
  } else {
    constexpr std::size_t kTrailer = 32;  // its byte 6: the size of an offset, the last before it
    const std::size_t trailer = bytes.size() - kTrailer;
    bytes.at(trailer - static_cast<unsigned char>(bytes.at(trailer + 6))) = '\xFF';
  }
  return inOneThreadBlock(bytes);
}

}  // namespace ironmoat::bench
