// The output records' throwing initialisers, and nothing else: a test that links definitions of its
// own gets those instead, since no other symbol pulls this file out of its library.
//
// This host accepts every value. What it is to refuse belongs here: throw before the record is
// made.

#include "ironmoat/command_response.h"
#include "ironmoat/http_headers.h"
#include "ironmoat/payload_parts.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat {

VeskCommandResponse VeskCommandResponse::with(Arguments arguments) {
  return VeskCommandResponse(std::move(arguments));
}

VeskCommandWebTunnelResponse VeskCommandWebTunnelResponse::with(Arguments arguments) {
  return VeskCommandWebTunnelResponse(std::move(arguments));
}

DrelUserPayloadHttpHeaders DrelUserPayloadHttpHeaders::with(Arguments arguments) {
  return DrelUserPayloadHttpHeaders(std::move(arguments));
}

DrelUserPayloadDeliveryContext DrelUserPayloadDeliveryContext::with(Arguments arguments) {
  return DrelUserPayloadDeliveryContext(std::move(arguments));
}

DrelHoplinePluginRequest DrelHoplinePluginRequest::with(Arguments arguments) {
  return DrelHoplinePluginRequest(std::move(arguments));
}

DrelHoplineAllocationStatus DrelHoplineAllocationStatus::with(Arguments arguments) {
  return DrelHoplineAllocationStatus(std::move(arguments));
}

DrelHoplineSelfAllocToken DrelHoplineSelfAllocToken::with(Arguments arguments) {
  return DrelHoplineSelfAllocToken(std::move(arguments));
}

DrelHoplinePluginAllocation DrelHoplinePluginAllocation::with(Arguments arguments) {
  return DrelHoplinePluginAllocation(std::move(arguments));
}

DrelUserPayload DrelUserPayload::with(Arguments arguments) {
  return DrelUserPayload(std::move(arguments));
}

}  // namespace ironmoat
