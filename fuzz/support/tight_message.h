#pragma once

#include <algorithm>
#include <cstring>
#include <string_view>

#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::testing {

/// The bytes at the very end of the memory that holds them, so that a sanitizer sees the first byte
/// read past them; a Data made in the ordinary way has room behind a short message. For tests and
/// fuzz targets.
inline Data tightMessage(std::string_view bytes) {
  constexpr std::size_t kNoSlackFrom = 256;  // smaller blocks have room to spare
  const std::size_t before = kNoSlackFrom - std::min(kNoSlackFrom, bytes.size());
  BlockBuilder builder;
  char* place = builder.extend(before + bytes.size());
  std::memset(place, '#', before);
  if (!bytes.empty()) std::memcpy(place + before, bytes.data(), bytes.size());
  const BlockRef block = builder.finish();
  return Data(detail::Slice(block.get(), static_cast<std::uint32_t>(before),
                            static_cast<std::uint32_t>(bytes.size())));
}

}  // namespace ironmoat::testing
