#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <string_view>
#include <vector>

#include "ironmoat/values.h"
#include "plist/encoder.h"

namespace ironmoat::bench {

/// A way for a message to be large. Its size grows with a count.
struct Shape {
  std::string_view name;
  /// Roughly the bytes of message for each unit of the count; the start of the search.
  std::size_t step;
  /// Returns nothing if the format has no such shape.
  std::function<std::optional<Data>(plist::Format form, std::size_t count)> make;
};

const std::vector<Shape>& shapes();

/// A message of the shape with about `bytes` bytes, and at most limits::messageBytes.
std::optional<Data> messageOfSize(const Shape& shape, plist::Format form, std::size_t bytes);

}  // namespace ironmoat::bench
