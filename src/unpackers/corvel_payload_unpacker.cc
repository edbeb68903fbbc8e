#include "unpackers/corvel_payload_unpacker.h"

#include "records/message_payload.h"
#include "unpackers/conversion.h"
#include "unpackers/decode_message.h"
#include "unpackers/header_block.h"

namespace ironmoat {

namespace {

/// The eight arguments that do not pass through, in the order in which they are made.
struct Converted {
  List<DrelUserPayload> dstIdTokenList;
  List<DrelUserPayload> corvelMessageList;
  Optional<DrelUserPayloadHttpHeaders> httpHeaders;
  Optional<DrelUserPayloadDeliveryContext> deliveryContext;
  List<DrelHoplinePluginRequest> pluginRequests;
  List<DrelHoplineAllocationStatus> allocationStatuses;
  List<DrelHoplineSelfAllocToken> selfAllocTokenList;
  List<DrelHoplinePluginAllocation> pluginAllocations;

  using R = Converted;
  using Fields = FieldList<R, &R::dstIdTokenList, &R::corvelMessageList, &R::httpHeaders,
                           &R::deliveryContext, &R::pluginRequests, &R::allocationStatuses,
                           &R::selfAllocTokenList, &R::pluginAllocations>;
};

DrelUserPayloadArguments convertPayload(const VeskCorvelProtocolPayload& wire);

/// An absent list and an empty one both give an empty one.
List<DrelUserPayload> convertPayloads(const Optional<List<VeskCorvelProtocolPayload>>& wire) {
  List<DrelUserPayload> output;
  if (!wire) return output;
  output.reserve(wire->size());
  for (const VeskCorvelProtocolPayload& element : *wire) {
    output.emplace_back([&] { return convertPayload(element); });
  }
  return output;
}

template <class Output, class Wire>
List<Output> convertRelayList(const Optional<List<Wire>>& wire) {
  List<Output> output;
  if (!wire) return output;
  output.reserve(wire->size());
  for (const Wire& element : *wire) {
    output.emplace_back([&] { return argumentsFrom<Output>(element); });
  }
  return output;
}

Optional<DrelUserPayloadDeliveryContext> convertDeliveryContext(
    const Optional<VeskCorvelProtocolDeliveryContext>& wire) {
  if (!wire) return {};
  return DrelUserPayloadDeliveryContext::with(argumentsFrom<DrelUserPayloadDeliveryContext>(*wire));
}

/// Children before parents: the arguments of the record's own initialiser, once every record in it
/// is made. Recurses as deep as payloads nest: at most half of limits::nestedContainers, which the
/// reader has checked.
DrelUserPayloadArguments convertPayload(const VeskCorvelProtocolPayload& wire) {
  Converted converted{
      .dstIdTokenList = convertPayloads(wire.dstIdTokenList),
      .corvelMessageList = convertPayloads(wire.corvelMessageList),
      .httpHeaders = convertHeaderBlock(wire.httpHeaders),
      .deliveryContext = convertDeliveryContext(wire.deliveryContext),
      .pluginRequests = convertRelayList<DrelHoplinePluginRequest>(wire.pluginRequests),
      .allocationStatuses = convertRelayList<DrelHoplineAllocationStatus>(wire.allocationStatuses),
      .selfAllocTokenList = convertRelayList<DrelHoplineSelfAllocToken>(wire.selfAllocTokenList),
      .pluginAllocations = convertRelayList<DrelHoplinePluginAllocation>(wire.pluginAllocations),
  };
  return argumentsFrom<DrelUserPayload>(wire, std::move(converted));
}

}  // namespace

Unpacked<DrelUserPayload> VeskCorvelPayloadUnpacker::unpack(const Data& message) const {
  VeskCorvelProtocolPayload wire;
  if (auto refusal = decodeMessage(message, wire)) return std::move(*refusal);
  return Unpacked<DrelUserPayload>([&] { return convertPayload(wire); });
}

}  // namespace ironmoat
