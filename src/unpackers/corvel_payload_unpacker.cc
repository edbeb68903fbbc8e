#include "unpackers/corvel_payload_unpacker.h"

#include "records/message_payload.h"
#include "unpackers/conversion.h"
#include "unpackers/decode_message.h"
#include "unpackers/header_block.h"
#include "values/record_arena.h"

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

using detail::RecordArena;

Converted convertParts(VeskCorvelProtocolPayload& wire, RecordArena& arena);
template <class Wire>
NothingConverted convertParts(Wire&, RecordArena&) {
  return {};
}

/// An absent list and an empty one both give an empty one. The wire list's memory goes back before
/// the lists around it are converted.
template <class Output, class Wire>
List<Output> convertList(Optional<List<Wire>>& wire, RecordArena& arena) {
  List<Output> output;
  if (!wire) return output;
  List<Wire> elements = std::move(*wire);
  {
    const RecordArena::Scope scope(arena);
    output.reserve(elements.size());
  }
  for (Wire& element : elements) {
    output.emplace_back(
        [&] { return argumentsFrom<Output>(std::move(element), convertParts(element, arena)); });
  }
  return output;
}

Optional<DrelUserPayloadDeliveryContext> convertDeliveryContext(
    Optional<VeskCorvelProtocolDeliveryContext>& wire) {
  if (!wire) return {};
  return DrelUserPayloadDeliveryContext::with(
      argumentsFrom<DrelUserPayloadDeliveryContext>(std::move(*wire)));
}

/// Children before parents: every record in a payload, before the arguments of its own initialiser.
/// Recurses as deep as payloads nest: at most half of limits::nestedContainers, which the reader
/// has checked.
Converted convertParts(VeskCorvelProtocolPayload& wire, RecordArena& arena) {
  return {
      .dstIdTokenList = convertList<DrelUserPayload>(wire.dstIdTokenList, arena),
      .corvelMessageList = convertList<DrelUserPayload>(wire.corvelMessageList, arena),
      .httpHeaders = convertHeaderBlock(wire.httpHeaders),
      .deliveryContext = convertDeliveryContext(wire.deliveryContext),
      .pluginRequests = convertList<DrelHoplinePluginRequest>(wire.pluginRequests, arena),
      .allocationStatuses =
          convertList<DrelHoplineAllocationStatus>(wire.allocationStatuses, arena),
      .selfAllocTokenList = convertList<DrelHoplineSelfAllocToken>(wire.selfAllocTokenList, arena),
      .pluginAllocations = convertList<DrelHoplinePluginAllocation>(wire.pluginAllocations, arena),
  };
}

}  // namespace

DrelUserPayload VeskCorvelPayloadUnpacker::unpack(const Data& message) const {
  VeskCorvelProtocolPayload wire;
  decodeMessage(message, wire);
  RecordArena arena(message.slice().block()->sharing());
  return DrelUserPayload(
      [&] { return argumentsFrom<DrelUserPayload>(std::move(wire), convertParts(wire, arena)); });
}

UnknownKeys VeskCorvelPayloadUnpacker::unknownKeys(const Data& message) const {
  return unknownKeysIn<VeskCorvelProtocolPayload>(message);
}

}  // namespace ironmoat
