#include "records/key_index.h"

#include <cstring>
#include <stdexcept>

namespace ironmoat::records {

namespace {

template <class Word>
std::uint64_t load(const char* at) noexcept {
  Word word;
  std::memcpy(&word, at, sizeof word);
  return word;
}

}  // namespace

/// First and last bytes and the length in one word. Texts that fold alike are told apart by the
/// comparison in find(); keys that did would never get apart, and the constructor says so.
std::uint64_t KeyIndex::fold(std::string_view text) noexcept {
  const char* first = text.data();
  const std::size_t size = text.size();
  std::uint64_t word = 0;
  if (size >= 8) {
    word = load<std::uint64_t>(first) ^ (load<std::uint64_t>(first + size - 8) << 1);
  } else if (size >= 4) {
    word = load<std::uint32_t>(first) | load<std::uint32_t>(first + size - 4) << 32;
  } else if (size > 0) {
    const auto byte = [&](std::size_t i) {
      return static_cast<std::uint64_t>(static_cast<unsigned char>(first[i]));
    };
    word = byte(0) | byte(size / 2) << 8 | byte(size - 1) << 16;
  }
  return word ^ (static_cast<std::uint64_t>(size) << 56);
}

KeyIndex::KeyIndex(std::span<const std::string_view> keys) : keys_(keys) {
  constexpr std::uint64_t kStep = 0x9E3779B97F4A7C15U;  // odd, its bits spread evenly
  constexpr int kTries = 1 << 20;
  std::uint64_t multiplier = kStep;
  for (int i = 0; i < kTries; ++i, multiplier += 2 * kStep) {
    if (tryMultiplier(multiplier)) return;
  }
  throw std::logic_error("no multiplier keeps the keys apart");
}

bool KeyIndex::tryMultiplier(std::uint64_t multiplier) noexcept {
  slots_.fill(kNoKey);
  multiplier_ = multiplier;
  for (std::size_t i = 0; i < keys_.size(); ++i) {
    std::uint8_t& slot = slots_[slotOf(fold(keys_[i]), multiplier)];
    if (slot != kNoKey) return false;
    slot = static_cast<std::uint8_t>(i);
  }
  return true;
}

}  // namespace ironmoat::records
