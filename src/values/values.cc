#include "ironmoat/values.h"

#include <stdexcept>

#include "values/block_builder.h"
#include "values/utf8.h"

namespace ironmoat {

namespace detail {

const char IRONMOAT_DETAIL_BUILT_FOR = 0;

Slice Slice::copyOf(std::string_view bytes, Sharing sharing) {
  BlockBuilder builder(sharing);
  builder.append(bytes);
  const BlockRef block = builder.finish();
  return {block.get(), 0, block ? block->size() : 0};
}

}  // namespace detail

String::String(std::string_view text) : slice_(detail::Slice::copyOf(text)) {
  if (!isValidUtf8(text)) throw std::invalid_argument("not a valid UTF-8 text");
}

}  // namespace ironmoat
