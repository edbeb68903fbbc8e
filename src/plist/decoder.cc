#include "plist/decoder.h"

#include <vector>

namespace ironmoat::plist {

namespace {

std::int64_t integer(const Decoder& decoder) {
  const Node& node = decoder.node();
  if (node.kind == Kind::unsignedInteger) decoder.failOutOfRange();
  return static_cast<std::int64_t>(decoder.expect(Kind::integer).payload);
}

detail::Slice slice(const Decoder& decoder, Kind kind) {
  const Node& node = decoder.expect(kind);
  decoder.chargeDelivered(node.count);
  return decoder.document().slice(node);
}

}  // namespace

template <>
Int decodeScalar<Int>(const Decoder& decoder) {
  return integer(decoder);
}

template <>
Int64 decodeScalar<Int64>(const Decoder& decoder) {
  return integer(decoder);
}

template <>
Bool decodeScalar<Bool>(const Decoder& decoder) {
  return decoder.expect(Kind::boolean).payload != 0;
}

template <>
String decodeScalar<String>(const Decoder& decoder) {
  return String(slice(decoder, Kind::string));
}

template <>
Data decodeScalar<Data>(const Decoder& decoder) {
  return Data(slice(decoder, Kind::data));
}

std::string Decoder::path() const {
  std::vector<const Decoder*> way;
  for (const Decoder* at = this; at->parent_ != nullptr; at = at->parent_) way.push_back(at);
  std::string path;
  for (auto at = way.rbegin(); at != way.rend(); ++at) {
    if ((*at)->key_ == nullptr) {
      path.append("[").append(std::to_string((*at)->index_)).append("]");
      continue;
    }
    if (!path.empty()) path += ".";
    path += *(*at)->key_;
  }
  return path;
}

void Decoder::failMismatch(Kind expected) const {
  std::string sentence("expected ");
  sentence.append(nameOf(expected)).append(", found ").append(nameOf(node().kind));
  throw DecodingError(DecodingError::Kind::typeMismatch, path(), sentence);
}

void Decoder::failOutOfRange() const {
  throw DecodingError(DecodingError::Kind::outOfRange, path(),
                      "integer does not fit in 64 bits with a sign");
}

void Decoder::failMissing(std::string_view key) const {
  throw DecodingError(DecodingError::Kind::keyNotFound, Decoder(*this, key, node_).path(),
                      "required key is missing");
}

void Decoder::failLimit(const char* what, std::size_t limit, const char* unit) const {
  throw DecodingError(DecodingError::Kind::limitExceeded, path(),
                      what + std::to_string(limit) + unit);
}

}  // namespace ironmoat::plist
