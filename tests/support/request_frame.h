#pragma once

#include <cstdint>
#include <string_view>

#include "frames/frame.h"

namespace ironmoat::frames {

/// Appends a whole request frame. Clients write a message from where it is instead.
inline void appendRequest(BlockBuilder& out, std::uint64_t id, std::string_view outputType,
                          std::string_view message) {
  appendRequestHead(out, id, outputType, message.size());
  out.append(message);
}

}  // namespace ironmoat::frames
