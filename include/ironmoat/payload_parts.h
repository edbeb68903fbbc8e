#pragma once

#include "ironmoat/output_record.h"

namespace ironmoat {

/// What DrelUserPayloadDeliveryContext is made with, in label order; `count` is labelled `with`.
struct DrelUserPayloadDeliveryContextArguments {
  Optional<Int> count;

  using R = DrelUserPayloadDeliveryContextArguments;
  using Fields = FieldList<R, &R::count>;
};
IRONMOAT_API void admit(const DrelUserPayloadDeliveryContextArguments& arguments);

/// The delivery context of a message payload.
struct DrelUserPayloadDeliveryContext
    : OutputRecord<DrelUserPayloadDeliveryContext, DrelUserPayloadDeliveryContextArguments> {
  using OutputRecord::OutputRecord;
};

/// What DrelHoplinePluginRequest is made with, in label order; `pluginName` is labelled `with`.
struct DrelHoplinePluginRequestArguments {
  Optional<String> pluginName;
  Optional<String> pluginConfig;
  Optional<Int> pluginStream;
  Optional<Bool> pluginDevMode;

  using R = DrelHoplinePluginRequestArguments;
  using Fields =
      FieldList<R, &R::pluginName, &R::pluginConfig, &R::pluginStream, &R::pluginDevMode>;
};
IRONMOAT_API void admit(const DrelHoplinePluginRequestArguments& arguments);

/// A plugin request of a message payload.
struct DrelHoplinePluginRequest
    : OutputRecord<DrelHoplinePluginRequest, DrelHoplinePluginRequestArguments> {
  using OutputRecord::OutputRecord;
};

/// What DrelHoplineAllocationStatus is made with, in label order; `participantId` is labelled
/// `with`.
struct DrelHoplineAllocationStatusArguments {
  Optional<Int64> participantId;
  Optional<Int> allocationStatus;
  Optional<Data> token;
  Optional<String> destinationId;

  using R = DrelHoplineAllocationStatusArguments;
  using Fields =
      FieldList<R, &R::participantId, &R::allocationStatus, &R::token, &R::destinationId>;
};
IRONMOAT_API void admit(const DrelHoplineAllocationStatusArguments& arguments);

/// One participant's allocation status.
struct DrelHoplineAllocationStatus
    : OutputRecord<DrelHoplineAllocationStatus, DrelHoplineAllocationStatusArguments> {
  using OutputRecord::OutputRecord;
};

/// What DrelHoplineSelfAllocToken is made with, in label order; `relayIp` is labelled `with`.
struct DrelHoplineSelfAllocTokenArguments {
  Optional<Data> relayIp;    ///< address as bytes
  Optional<Data> relayIpv6;  ///< address as bytes
  Optional<Int> relayPort;
  Optional<Data> relaySessionKey;
  Optional<Data> relaySessionId;
  Optional<Data> relayAccessToken;
  Optional<Int> relayProvider;

  using R = DrelHoplineSelfAllocTokenArguments;
  using Fields = FieldList<R, &R::relayIp, &R::relayIpv6, &R::relayPort, &R::relaySessionKey,
                           &R::relaySessionId, &R::relayAccessToken, &R::relayProvider>;
};
IRONMOAT_API void admit(const DrelHoplineSelfAllocTokenArguments& arguments);

/// A self-allocation token: a relay and what opens a session on it.
struct DrelHoplineSelfAllocToken
    : OutputRecord<DrelHoplineSelfAllocToken, DrelHoplineSelfAllocTokenArguments> {
  using OutputRecord::OutputRecord;
};

/// What DrelHoplinePluginAllocation is made with, in label order; `pluginName` is labelled `with`.
struct DrelHoplinePluginAllocationArguments {
  Optional<String> pluginName;
  Optional<Int> pluginStream;
  Optional<Int64> participantId;
  Optional<Data> relaySessionKey;
  Optional<Data> relayAccessToken;

  using R = DrelHoplinePluginAllocationArguments;
  using Fields = FieldList<R, &R::pluginName, &R::pluginStream, &R::participantId,
                           &R::relaySessionKey, &R::relayAccessToken>;
};
IRONMOAT_API void admit(const DrelHoplinePluginAllocationArguments& arguments);

/// A plugin allocation of a message payload.
struct DrelHoplinePluginAllocation
    : OutputRecord<DrelHoplinePluginAllocation, DrelHoplinePluginAllocationArguments> {
  using OutputRecord::OutputRecord;
};

}  // namespace ironmoat
