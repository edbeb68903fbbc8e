#include "plist/decoder.h"

#include <algorithm>

#include "plist/position.h"
#include "values/utf8.h"

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
  return positionOf(node_, *decoding_.message);
}

void Decoder::reject(DecodingError::Kind kind, const std::string& description) const {
  decoding_.rejection.emplace(kind, path(), description, offset());
}

void Decoder::rejectMismatch(Kind expected) const {
  std::string description;
  description.reserve(40);  // one allocation, not two
  description.append("expected ").append(nameOf(expected));
  description.append(", found ").append(nameOf(node().kind));
  reject(DecodingError::Kind::typeMismatch, description);
}

void Decoder::rejectOutOfRange() const {
  reject(DecodingError::Kind::outOfRange, "not a valid signed 64-bit integer");
}

void Decoder::rejectScalar(Kind expected) const {
  if (node().kind == Kind::wideInteger && expected == Kind::integer) {
    rejectOutOfRange();
  } else if (expect(expected)) {
    (void)chargeDelivered(node().count);
  }
}

void Decoder::rejectMissing(const std::string_view& key) const {
  std::string description("missing required key");
  const auto keys = document_.keys(node());
  if (std::any_of(keys.begin(), keys.end(), [&](NodeIndex other) {
        return equalsIgnoringCase(document_.text(document_.node(other)), key);
      })) {
    description += "; found a key that differs only in case";
  }
  Decoder(*this, key, node_).reject(DecodingError::Kind::keyNotFound, description);
}

void Decoder::addUnknownKey(std::string_view key) const {
  UnknownKeysArguments& found = *decoding_.unknownKeys;
  ++found.count;  // at most limits::scannedEntries
  if (found.paths.size() == UnknownKeys::kMaxPaths) return;
  key = key.substr(0, UnknownKeys::kMaxKeyBytes);
  key = key.substr(0, validUtf8Prefix(key));
  found.paths.emplace_back(Decoder(*this, key, node_).path());
}

void Decoder::rejectLimit(const char* what, std::size_t limit, const char* unit) const {
  reject(DecodingError::Kind::limitExceeded, what + std::to_string(limit) + unit);
}

}  // namespace ironmoat::plist
