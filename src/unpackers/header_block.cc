#include "unpackers/header_block.h"

#include "unpackers/conversion.h"

namespace ironmoat {

Optional<DrelUserPayloadHttpHeaders> convertHeaderBlock(
    const Optional<VeskCorvelProtocolHttpHeaders>& block) {
  if (!block) return {};
  return DrelUserPayloadHttpHeaders::with(argumentsFrom<DrelUserPayloadHttpHeaders>(*block));
}

}  // namespace ironmoat
