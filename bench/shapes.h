#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <string_view>
#include <vector>

#include "ironmoat/values.h"
#include "plist/encoder.h"

namespace ironmoat::bench {

/// A way for a message to be large. Each grows with a count of its own.
struct Shape {
  std::string_view name;
  /// About how many bytes of message one more of the count is; says where to start.
  std::size_t step;
  /// Nothing where the form has no such shape.
  std::function<std::optional<Data>(plist::Format form, std::size_t count)> make;
};

const std::vector<Shape>& shapes();

/// A message of the shape of about so many bytes, and at most limits::messageBytes.
std::optional<Data> messageOfSize(const Shape& shape, plist::Format form, std::size_t bytes);

}  // namespace ironmoat::bench
