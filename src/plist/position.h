#pragma once

#include <cstdint>

#include "ironmoat/values.h"
#include "plist/document.h"

namespace ironmoat::plist {

/// The offset of a node in `message`; in XML that of its start tag. Requires a node of a document
/// that was read from exactly these bytes. Constant time for a binary message, linear for XML.
std::uint64_t positionOf(NodeIndex node, const Data& message);

}  // namespace ironmoat::plist
