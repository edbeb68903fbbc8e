#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string_view>

namespace ironmoat::records {

/// No place: what the lookups answer for text that is no key.
inline constexpr std::size_t kNoKey = 0xFF;
inline constexpr std::size_t kMaxKeys = 0xFF;  // places are bytes, one of which is kNoKey

/// From key text to its place in a table, for short tables: the first key that equals it.
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

/// From key text to its place in a table, for long tables: one multiplication, one look into a
/// table of bytes and one comparison. Read-only once built.
class KeyIndex {
 public:
  /// Finds a multiplier under which the keys, which must be distinct and outlive the index, take
  /// different slots.
  explicit KeyIndex(std::span<const std::string_view> keys);

  /// The place of the key that equals `text`, or kNoKey.
  [[nodiscard]] std::size_t find(std::string_view text) const noexcept {
    const std::uint64_t folded = fold(text);
    const std::size_t place = slots_[slotOf(folded, multiplier_)];
    if (place == kNoKey || folds_[place] != folded || keys_[place].size() != text.size()) {
      return kNoKey;
    }
    // Up to 7 bytes the fold holds the whole text.
    return text.size() < 8 || keys_[place] == text ? place : kNoKey;
  }

 private:
  // 2,048 slots for 150 keys: about one multiplier in 230 keeps them all apart.
  static constexpr unsigned kSlotBits = 11;

  template <class Word>
  static std::uint64_t load(const char* at) noexcept {
    Word word;
    std::memcpy(&word, at, sizeof word);
    return word;
  }
  /// First and last bytes and the length in one word: up to 7 bytes all of the text, beyond that
  /// texts may fold alike. Keys that do never get apart; the constructor says so.
  static std::uint64_t fold(std::string_view text) noexcept {
    const char* const first = text.data();
    const std::size_t size = text.size();
    std::uint64_t word = 0;
    if (size >= 8) {
      word = load<std::uint64_t>(first) ^ (load<std::uint64_t>(first + size - 8) << 1);
    } else if (size >= 4) {
      // The halves overlap in one byte; each byte of the text also stands somewhere by itself.
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
