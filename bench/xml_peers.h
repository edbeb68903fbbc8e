#pragma once

#include <cstddef>
#include <string_view>

namespace ironmoat::bench {

/// Parses with expat, counting what its handlers are told; nothing is kept.
std::size_t expatEvents(std::string_view xml);

/// Parses into pugixml's DOM in the least way that it offers: no references resolved, no line ends
/// folded, no comments kept. Looks at the root's name.
std::size_t pugixmlDom(std::string_view xml);

}  // namespace ironmoat::bench
