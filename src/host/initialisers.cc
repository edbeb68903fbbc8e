// The checks of the host's initialisers, and nothing else: a test that defines its own links them
// instead, since no other symbol takes this file from its library.
//
// This host accepts every value. To reject one, throw here: no record is made, and the daemon gets
// a DecodingError `rejectedByHost`, with the description of a std::exception.

#include "ironmoat/command_response.h"
#include "ironmoat/http_headers.h"
#include "ironmoat/payload_parts.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat {

void admit(const VeskCommandResponseArguments&) {}
void admit(const VeskCommandWebTunnelResponseArguments&) {}
void admit(const DrelUserPayloadHttpHeadersArguments&) {}
void admit(const DrelUserPayloadDeliveryContextArguments&) {}
void admit(const DrelHoplinePluginRequestArguments&) {}
void admit(const DrelHoplineAllocationStatusArguments&) {}
void admit(const DrelHoplineSelfAllocTokenArguments&) {}
void admit(const DrelHoplinePluginAllocationArguments&) {}
void admit(const DrelUserPayloadArguments&) {}

}  // namespace ironmoat
