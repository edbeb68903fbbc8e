#include "plist/decoder.h"

#include <algorithm>
#include <vector>

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

std::optional<std::uint64_t> Decoder::offset() const {
  if (budget_.message == nullptr) return std::nullopt;
  return placeOf(node_, *budget_.message);
}

// The errors are made apart from where they are thrown, so that unwinding finds nothing to clean up
// there: each place where it stops takes a tenth of the time of a refusal.

void Decoder::failMismatch(Kind expected) const { throw mismatch(expected); }

DecodingError Decoder::mismatch(Kind expected) const {
  std::string sentence("expected ");
  sentence.append(nameOf(expected)).append(", found ").append(nameOf(node().kind));
  return {DecodingError::Kind::typeMismatch, path(), sentence, offset()};
}

void Decoder::failOutOfRange() const { throw outOfRange(); }

DecodingError Decoder::outOfRange() const {
  return {DecodingError::Kind::outOfRange, path(), "integer does not fit in 64 bits with a sign",
          offset()};
}

void Decoder::failMissing(std::string_view key) const { throw missing(key); }

DecodingError Decoder::missing(std::string_view key) const {
  std::string sentence("required key is missing");
  const auto keys = document_.keys(node());
  if (std::any_of(keys.begin(), keys.end(), [&](NodeIndex other) {
        return equalsIgnoringCase(document_.text(document_.node(other)), key);
      })) {
    sentence += "; one that differs from it only in case is there";
  }
  return {DecodingError::Kind::keyNotFound, Decoder(*this, key, node_).path(), sentence, offset()};
}

void Decoder::failLimit(const char* what, std::size_t limit, const char* unit) const {
  throw DecodingError(DecodingError::Kind::limitExceeded, path(),
                      what + std::to_string(limit) + unit, offset());
}

}  // namespace ironmoat::plist
