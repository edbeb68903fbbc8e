#include "records/key_index.h"

#include <algorithm>
#include <stdexcept>

namespace ironmoat::records {

KeyIndex::KeyIndex(std::span<const std::string_view> keys) : keys_(keys) {
  std::transform(keys.begin(), keys.end(), ends_.begin(), [](std::string_view key) {
    char padded[kWord] = {};
    std::copy_n(key.begin(), std::min(key.size(), kWord), padded);
    return endsOf(key.size() < kWord ? std::string_view(padded, key.size()) : key);
  });
  constexpr std::uint64_t kStep = 0x9E3779B97F4A7C15U;  // odd, its bits spread evenly
  constexpr int kTries = 1 << 20;
  std::uint64_t multiplier = kStep;
  for (int i = 0; i < kTries; ++i, multiplier += 2 * kStep) {
    if (tryMultiplier(multiplier)) return;
  }
  throw std::logic_error("missing multiplier that gives each key a slot");
}

bool KeyIndex::tryMultiplier(std::uint64_t multiplier) noexcept {
  slots_.fill(kNoKey);
  multiplier_ = multiplier;
  for (std::size_t i = 0; i < keys_.size(); ++i) {
    std::uint8_t& slot = slots_[slotOf(ends_[i], multiplier)];
    if (slot != kNoKey) return false;
    slot = static_cast<std::uint8_t>(i);
  }
  return true;
}

}  // namespace ironmoat::records
