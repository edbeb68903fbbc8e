#pragma once

#include <cstdint>
#include <string_view>

#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::frames {

/// For tests: `bytes` as a slice that ends where its block's memory ends, so that a sanitizer sees
/// the first byte read past it.
inline Data atBlockEnd(std::string_view bytes) {
  constexpr std::uint32_t kAhead = 256;  // more than a builder allocates at the least
  BlockBuilder builder;
  builder.reserve(kAhead + bytes.size());
  builder.extend(kAhead);
  builder.append(bytes);
  const BlockRef block = builder.finish();
  return Data(detail::Slice(block.get(), kAhead, block->size() - kAhead));
}

}  // namespace ironmoat::frames
