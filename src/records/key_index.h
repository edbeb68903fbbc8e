#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string_view>

namespace ironmoat::records {

/// The result of a lookup of text that is not a key.
inline constexpr std::size_t kNoKey = 0xFF;
inline constexpr std::size_t kMaxKeys = 0xFF;  // positions are bytes other than kNoKey

/// Maps a key's text to its position in a table by one multiplication, one lookup in a table of
/// bytes and one comparison, without a branch that depends on the length. Immutable.
class KeyIndex {
 public:
  /// Searches a multiplier that gives each key a slot of its own. The keys must be distinct and
  /// must outlive the index.
  explicit KeyIndex(std::span<const std::string_view> keys);

  /// The position of the key that equals `text`, or kNoKey.
  [[nodiscard]] std::size_t find(std::string_view text) const noexcept {
    char padded[kWord] = {};
    if (text.size() >= kWord) return findReadable(text);
    std::copy(text.begin(), text.end(), padded);
    return findReadable({padded, text.size()});
  }
  /// The same for text from whose beginning 8 bytes can be read.
  [[nodiscard]] std::size_t findReadable(std::string_view text) const noexcept {
    const Ends ends = endsOf(text);
    const std::size_t place = slots_[slotOf(ends, multiplier_)];
    if (place == kNoKey) return kNoKey;
    const Ends& key = ends_[place];
    if (((key.first ^ ends.first) | (key.last ^ ends.last) | (key.size ^ ends.size)) != 0) {
      return kNoKey;
    }
    // The ends of up to 16 bytes contain the whole text.
    return text.size() <= 2 * kWord || keys_[place] == text ? place : kNoKey;
  }

 private:
  // 2,048 slots for 150 keys: about one multiplier in 230 gives each key its own.
  static constexpr unsigned kSlotBits = 11;
  static constexpr std::size_t kWord = 8;

  /// The first 8 bytes, the last 8 bytes and the length; of a shorter text, all of it twice.
  struct Ends {
    std::uint64_t first;
    std::uint64_t last;
    std::uint64_t size;
  };

  static std::uint64_t load(const char* at) noexcept {
    std::uint64_t word;
    std::memcpy(&word, at, sizeof word);
    return word;
  }
  static Ends endsOf(std::string_view text) noexcept {
    static constexpr std::uint64_t kMasks[kWord + 1] = {0,
                                                        0xFF,
                                                        0xFFFF,
                                                        0xFFFFFF,
                                                        0xFFFFFFFF,
                                                        0xFFFFFFFFFF,
                                                        0xFFFFFFFFFFFF,
                                                        0xFFFFFFFFFFFFFF,
                                                        ~std::uint64_t{0}};
    const std::uint64_t mask = kMasks[std::min(text.size(), kWord)];
    const char* const last = text.data() + (std::max(text.size(), kWord) - kWord);
    return {load(text.data()) & mask, load(last) & mask, text.size()};
  }
  static std::size_t slotOf(const Ends& ends, std::uint64_t multiplier) noexcept {
    const std::uint64_t folded = ends.first ^ (ends.last << 1) ^ (ends.size << 56);
    return static_cast<std::size_t>((folded * multiplier) >> (64 - kSlotBits));
  }
  bool tryMultiplier(std::uint64_t multiplier) noexcept;

  std::span<const std::string_view> keys_;
  std::uint64_t multiplier_ = 0;
  std::array<Ends, kMaxKeys> ends_;  // of the keys
  std::array<std::uint8_t, std::size_t{1} << kSlotBits> slots_;
};

}  // namespace ironmoat::records
