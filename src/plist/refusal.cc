#include "plist/refusal.h"

#include "ironmoat/limits.h"

namespace ironmoat::plist {

DecodingError malformed(std::string_view reason, std::uint64_t offset) {
  return {DecodingError::Kind::malformed, "",
          std::string(reason) + " at offset " + std::to_string(offset), offset};
}

DecodingError tooDeep() {
  return {DecodingError::Kind::limitExceeded, "",
          "more than " + std::to_string(limits::nestedContainers) +
              " dictionaries and arrays inside one another"};
}

}  // namespace ironmoat::plist
