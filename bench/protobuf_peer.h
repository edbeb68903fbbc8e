#pragma once

#include <cstddef>
#include <string>

#include "records/message_payload.h"

namespace ironmoat::bench {

/// Serializes the record in the schema that is generated from the records' tables, with
/// `unknown` integers that the schema lacks added.
std::string protobufOf(const VeskCorvelProtocolPayload& record, std::size_t unknown = 0);

/// Each parses one message and destroys it; returns its `command`.
long long parseProtobuf(const std::string& bytes);
/// With a new arena for the message.
long long parseProtobufInArena(const std::string& bytes);
/// With an arena whose first 64 KiB are already allocated.
long long parseProtobufInWarmArena(const std::string& bytes);

}  // namespace ironmoat::bench
