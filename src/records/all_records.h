#pragma once

#include <string_view>

#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/payload_parts.h"
#include "records/web_tunnel.h"

namespace ironmoat::records {

/// Calls `act.template operator()<Output, Wire>()` for each output record and the wire record that
/// it is made of. For programs that print or try all tables.
template <class Act>
void forEachRecord(Act act) {
  act.template operator()<VeskCommandResponse, VeskCommandResponseSchema>();
  act.template operator()<VeskCommandWebTunnelResponse, VeskCommandWebTunnelResponseSchema>();
  act.template operator()<DrelUserPayload, VeskCorvelProtocolPayload>();
  act.template operator()<DrelUserPayloadHttpHeaders, VeskCorvelProtocolHttpHeaders>();
  act.template operator()<DrelUserPayloadDeliveryContext, VeskCorvelProtocolDeliveryContext>();
  act.template operator()<DrelHoplinePluginRequest, VeskHoplinePluginRequest>();
  act.template operator()<DrelHoplineAllocationStatus, VeskHoplineAllocationStatus>();
  act.template operator()<DrelHoplineSelfAllocToken, VeskHoplineSelfAllocToken>();
  act.template operator()<DrelHoplinePluginAllocation, VeskHoplinePluginAllocation>();
}

/// A class's own name, without its scope.
template <class Named>
constexpr std::string_view className() {
  const std::string_view pretty = __PRETTY_FUNCTION__;  // ...Named = Scope::Class] or ...; ...]
  const std::size_t end = pretty.find_first_of(";]", pretty.find("Named = "));
  const std::size_t start = pretty.find_last_of(": ", end - 1) + 1;
  return pretty.substr(start, end - start);
}

}  // namespace ironmoat::records
