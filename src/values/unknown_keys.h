#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "ironmoat/output_record.h"

namespace ironmoat {

struct UnknownKeysArguments {
  Int count = 0;
  List<String> paths;

  using R = UnknownKeysArguments;
  using Fields = FieldList<R, &R::count, &R::paths>;
};
inline void admit(const UnknownKeysArguments&) {}

/// The keys of a message's dictionaries that no field has: how many entries have one, and the paths
/// of the first. Decoding ignores them, so a service reports them only when it is asked for them.
struct UnknownKeys : OutputRecord<UnknownKeys, UnknownKeysArguments> {
  using OutputRecord::OutputRecord;
  static constexpr std::string_view schemaName = "UnknownKeys";
  static constexpr std::size_t kMaxPaths = 100;
  static constexpr std::size_t kMaxKeyBytes = 255;  ///< of the unknown key at the end of a path
};

/// The output type that asks for the unknown keys of messages for `outputType`.
inline std::string unknownKeysOf(std::string_view outputType) {
  return std::string(outputType).append(".").append(UnknownKeys::schemaName);
}

}  // namespace ironmoat
