#include "plist/decoder.h"

#include <algorithm>

#include "plist/place.h"

namespace ironmoat::plist {

namespace {

char lowered(char c) noexcept { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c; }

bool equalsIgnoringCase(std::string_view a, std::string_view b) noexcept {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [](char x, char y) { return lowered(x) == lowered(y); });
}

}  // namespace

std::string Decoder::path() const {
  std::string path;  // from its end, the way that is known
  for (const Decoder* at = this; at->parent_ != nullptr; at = at->parent_) {
    if (at->key_ != nullptr) {
      path.append(at->key_->rbegin(), at->key_->rend());
      if (at->parent_->parent_ != nullptr) path += '.';
    } else {
      const std::string index = std::to_string(at->index_);
      path += ']';
      path.append(index.rbegin(), index.rend()) += '[';
    }
  }
  std::reverse(path.begin(), path.end());
  return path;
}

std::optional<std::uint64_t> Decoder::offset() const {
  if (decoding_.message == nullptr) return std::nullopt;
  return placeOf(node_, *decoding_.message);
}

void Decoder::refuse(DecodingError::Kind kind, const std::string& sentence) const {
  decoding_.refusal.emplace(kind, path(), sentence, offset());
}

void Decoder::refuseMismatch(Kind expected) const {
  std::string sentence;
  sentence.reserve(40);  // one allocation, not two
  sentence.append("expected ").append(nameOf(expected));
  sentence.append(", found ").append(nameOf(node().kind));
  refuse(DecodingError::Kind::typeMismatch, sentence);
}

void Decoder::refuseOutOfRange() const {
  refuse(DecodingError::Kind::outOfRange, "integer does not fit in 64 bits with a sign");
}

void Decoder::refuseMissing(const std::string_view& key) const {
  std::string sentence("required key is missing");
  const auto keys = document_.keys(node());
  if (std::any_of(keys.begin(), keys.end(), [&](NodeIndex other) {
        return equalsIgnoringCase(document_.text(document_.node(other)), key);
      })) {
    sentence += "; one that differs from it only in case is there";
  }
  Decoder(*this, key, node_).refuse(DecodingError::Kind::keyNotFound, sentence);
}

void Decoder::refuseLimit(const char* what, std::size_t limit, const char* unit) const {
  refuse(DecodingError::Kind::limitExceeded, what + std::to_string(limit) + unit);
}

}  // namespace ironmoat::plist
