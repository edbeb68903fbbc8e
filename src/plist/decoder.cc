#include "plist/decoder.h"

#include <vector>

namespace ironmoat::plist {

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
