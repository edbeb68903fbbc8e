#pragma once

#include <cstdint>
#include <span>
#include <string_view>

namespace ironmoat::fuzz {

enum class Holds : std::uint8_t { integer, boolean, text, data, texts, record, records };

struct WireKey {
  std::string_view key;
  Holds holds;
};

/// The distinct keys of all records, from their tables.
std::span<const WireKey> wireKeys();

}  // namespace ironmoat::fuzz
