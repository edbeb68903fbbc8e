#pragma once

#include <array>
#include <string_view>

#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat::inspect {

/// An output record's name, and the keys that its fields have in messages, in label order. This
/// room cannot see the tables of keys: the build prints them out and has them compiled in.
template <class R>
struct WireTable;

#include "wire_tables.inc"

}  // namespace ironmoat::inspect
