#pragma once

#include <cstddef>
#include <string>

#include "records/message_payload.h"

namespace ironmoat::bench {

/// The same content as a serialized message of the schema that is made from the records' tables,
/// and so many integers that the schema does not know.
std::string protobufOf(const VeskCorvelProtocolPayload& record, std::size_t unknown = 0);

/// Each parses one message and destroys it; returns its `command`.
long long parseProtobuf(const std::string& bytes);
/// As one would for a request: an arena of its own.
long long parseProtobufInArena(const std::string& bytes);
/// The arena's first 64 KiB are there already: no allocation for messages that fit.
long long parseProtobufInWarmArena(const std::string& bytes);

}  // namespace ironmoat::bench
