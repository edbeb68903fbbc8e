#pragma once

#include <array>
#include <string_view>

#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat::inspect {

/// The name of an output record, and its fields' keys in messages, in label order. The build
/// generates the specialisations, because this module must not depend on the one with the tables of
/// keys.
template <class R>
struct WireTable;

#include "wire_tables.inc"

}  // namespace ironmoat::inspect
