#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "values/block_builder.h"

namespace ironmoat::plist {

/// Ways to decode, which give the same. Shuffling needs a processor that can.
enum class Base64Way : std::uint8_t { tables, shuffles };
[[nodiscard]] Base64Way fastestBase64Way() noexcept;

/// Appends the bytes that `text` stands for. White space (space, tab, CR, LF) may stand anywhere;
/// otherwise only the alphabet, padding where and as long as it must be, and zero bits in what the
/// last character does not use.
///
/// Returns nothing, or where the text stops being base64 (its size when it is incomplete); `out` is
/// then as it was. `text` must not lie in `out`.
[[nodiscard]] std::optional<std::size_t> decodeBase64(std::string_view text, BlockBuilder& out,
                                                      Base64Way way = fastestBase64Way());

/// Appends `bytes` as base64, padded, without white space.
void encodeBase64(std::string_view bytes, BlockBuilder& out);

}  // namespace ironmoat::plist
