#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "values/block_builder.h"

namespace ironmoat::plist {

/// Decoders with the same results. `shuffles` needs a processor with SSSE3.
enum class Base64Way : std::uint8_t { tables, shuffles };
[[nodiscard]] Base64Way fastestBase64Way() noexcept;

/// Decodes `text` and appends the bytes to `out`. White space (space, tab, CR, LF) is allowed
/// anywhere. Padding is required, and the unused bits of the last character must be zero.
///
/// Returns nothing if the text is valid. Otherwise returns the position of the first invalid
/// character, or the size of an incomplete text, and leaves `out` unchanged. `text` must not lie in
/// `out`.
[[nodiscard]] std::optional<std::size_t> decodeBase64(std::string_view text, BlockBuilder& out,
                                                      Base64Way way = fastestBase64Way());

/// Appends `bytes` as padded base64 without white space.
void encodeBase64(std::string_view bytes, BlockBuilder& out);

}  // namespace ironmoat::plist
