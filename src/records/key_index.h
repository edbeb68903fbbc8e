#pragma once

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

/// Maps a key's text to its position in a table by comparing all keys. For short tables.
class KeyScan {
 public:
  static constexpr std::size_t kLongest = 13;

  constexpr explicit KeyScan(std::span<const std::string_view> keys) : keys_(keys) {}

  [[nodiscard]] std::size_t find(std::string_view text) const noexcept {
    for (std::size_t i = 0; i < keys_.size(); ++i) {
      if (keys_[i] == text) return i;
    }
    return kNoKey;
  }

 private:
  std::span<const std::string_view> keys_;
};

/// Maps a key's text to its position in a table by one multiplication, one lookup in a table of
/// bytes and one comparison. For long tables. Immutable.
class KeyIndex {
 public:
  /// Searches a multiplier that gives each key a slot of its own. The keys must be distinct and
  /// must outlive the index.
  explicit KeyIndex(std::span<const std::string_view> keys);

  /// The position of the key that equals `text`, or kNoKey.
  [[nodiscard]] std::size_t find(std::string_view text) const noexcept {
    const std::uint64_t folded = fold(text);
    const std::size_t place = slots_[slotOf(folded, multiplier_)];
    if (place == kNoKey || folds_[place] != folded || keys_[place].size() != text.size()) {
      return kNoKey;
    }
    // The fold of up to 7 bytes contains the whole text.
    return text.size() < 8 || keys_[place] == text ? place : kNoKey;
  }

 private:
  // 2,048 slots for 150 keys: about one multiplier in 230 gives each key its own.
  static constexpr unsigned kSlotBits = 11;

  template <class Word>
  static std::uint64_t load(const char* at) noexcept {
    Word word;
    std::memcpy(&word, at, sizeof word);
    return word;
  }
  /// Combines the first bytes, the last bytes and the length in one word. Longer texts than 7 bytes
  /// may have the same fold; the constructor throws std::logic_error if two keys do.
  static std::uint64_t fold(std::string_view text) noexcept {
    const char* const first = text.data();
    const std::size_t size = text.size();
    std::uint64_t word = 0;
    if (size >= 8) {
      word = load<std::uint64_t>(first) ^ (load<std::uint64_t>(first + size - 8) << 1);
    } else if (size >= 4) {
      // The halves may overlap in one byte, yet each byte of the text has bits of its own.
      word = load<std::uint32_t>(first) | load<std::uint32_t>(first + size - 4) << 24;
    } else if (size > 0) {
      const auto byte = [&](std::size_t i) {
        return static_cast<std::uint64_t>(static_cast<unsigned char>(first[i]));
      };
      word = byte(0) | byte(size / 2) << 8 | byte(size - 1) << 16;
    }
    return word ^ (static_cast<std::uint64_t>(size) << 56);
  }
  static std::size_t slotOf(std::uint64_t folded, std::uint64_t multiplier) noexcept {
    return static_cast<std::size_t>((folded * multiplier) >> (64 - kSlotBits));
  }
  bool tryMultiplier(std::uint64_t multiplier) noexcept;

  std::span<const std::string_view> keys_;
  std::uint64_t multiplier_ = 0;
  std::array<std::uint64_t, kMaxKeys> folds_{};  // of the keys
  std::array<std::uint8_t, std::size_t{1} << kSlotBits> slots_;
};

}  // namespace ironmoat::records
