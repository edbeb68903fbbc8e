#include "plist/rejection.h"

#include <cstddef>
#include <string>

#include "ironmoat/limits.h"

namespace ironmoat::plist {

DecodingError malformed(std::string_view reason, std::uint64_t offset) {
  constexpr std::string_view kWhere = " at offset ";
  constexpr std::size_t kMaxDigits = 20;
  std::string description;
  description.reserve(reason.size() + kWhere.size() + kMaxDigits);
  description.append(reason).append(kWhere).append(std::to_string(offset));
  return {DecodingError::Kind::malformed, "", description, offset};
}

DecodingError tooDeep() {
  return {
      DecodingError::Kind::limitExceeded, "",
      "nesting exceeds the limit of " + std::to_string(limits::nestedContainers) + " containers"};
}

}  // namespace ironmoat::plist
