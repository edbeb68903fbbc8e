#include "plist/refusal.h"

#include <cstddef>
#include <string>

#include "ironmoat/limits.h"

namespace ironmoat::plist {

DecodingError malformed(std::string_view reason, std::uint64_t offset) {
  constexpr std::string_view kWhere = " at offset ";
  constexpr std::size_t kMostDigits = 20;
  std::string sentence;
  sentence.reserve(reason.size() + kWhere.size() + kMostDigits);
  sentence.append(reason).append(kWhere).append(std::to_string(offset));
  return {DecodingError::Kind::malformed, "", sentence, offset};
}

DecodingError tooDeep() {
  return {DecodingError::Kind::limitExceeded, "",
          "more than " + std::to_string(limits::nestedContainers) +
              " dictionaries and arrays inside one another"};
}

}  // namespace ironmoat::plist
