#pragma once

#include <cstddef>
#include <string_view>

namespace ironmoat::bench {

/// Parses with expat, and returns the number of events.
std::size_t expatEvents(std::string_view xml);

/// Parses into pugixml's DOM with `parse_minimal`: without resolving references, normalising line
/// ends or keeping comments. The result depends on the root, so that the compiler keeps the work.
std::size_t pugixmlDom(std::string_view xml);

}  // namespace ironmoat::bench
