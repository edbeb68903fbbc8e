#pragma once

#include <string_view>
#include <utility>

#include "ironmoat/output_record.h"

namespace ironmoat {

/// What DrelUserPayloadDeliveryContext is made with, in label order; `count` is labelled `with`.
struct DrelUserPayloadDeliveryContextArguments {
  Optional<Int> count;

  using R = DrelUserPayloadDeliveryContextArguments;
  using Fields = FieldList<R, &R::count>;
};
/// Throws what the host refuses.
void admit(const DrelUserPayloadDeliveryContextArguments& arguments);
static_assert(DrelUserPayloadDeliveryContextArguments::Fields::check());

/// The delivery context of a message payload.
struct DrelUserPayloadDeliveryContext : DrelUserPayloadDeliveryContextArguments {
  using Arguments = DrelUserPayloadDeliveryContextArguments;

  [[nodiscard]] static DrelUserPayloadDeliveryContext with(Arguments arguments) {
    return DrelUserPayloadDeliveryContext([&] { return Arguments(std::move(arguments)); });
  }
  template <MakerOf<Arguments> Make>
  explicit DrelUserPayloadDeliveryContext(Make&& make) : Arguments(make()) {
    admit(*this);
  }
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
/// Throws what the host refuses.
void admit(const DrelHoplinePluginRequestArguments& arguments);
static_assert(DrelHoplinePluginRequestArguments::Fields::check());

/// A plugin request of a message payload.
struct DrelHoplinePluginRequest : DrelHoplinePluginRequestArguments {
  using Arguments = DrelHoplinePluginRequestArguments;

  [[nodiscard]] static DrelHoplinePluginRequest with(Arguments arguments) {
    return DrelHoplinePluginRequest([&] { return Arguments(std::move(arguments)); });
  }
  template <MakerOf<Arguments> Make>
  explicit DrelHoplinePluginRequest(Make&& make) : Arguments(make()) {
    admit(*this);
  }
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
/// Throws what the host refuses.
void admit(const DrelHoplineAllocationStatusArguments& arguments);
static_assert(DrelHoplineAllocationStatusArguments::Fields::check());

/// One participant's allocation status.
struct DrelHoplineAllocationStatus : DrelHoplineAllocationStatusArguments {
  using Arguments = DrelHoplineAllocationStatusArguments;

  [[nodiscard]] static DrelHoplineAllocationStatus with(Arguments arguments) {
    return DrelHoplineAllocationStatus([&] { return Arguments(std::move(arguments)); });
  }
  template <MakerOf<Arguments> Make>
  explicit DrelHoplineAllocationStatus(Make&& make) : Arguments(make()) {
    admit(*this);
  }
};

/// What DrelHoplineSelfAllocToken is made with, in label order; `relayIp` is labelled `with`.
struct DrelHoplineSelfAllocTokenArguments {
  Optional<Data> relayIp;
  Optional<Data> relayIpv6;
  Optional<Int> relayPort;
  Optional<Data> relaySessionKey;
  Optional<Data> relaySessionId;
  Optional<Data> relayAccessToken;
  Optional<Int> relayProvider;

  using R = DrelHoplineSelfAllocTokenArguments;
  using Fields = FieldList<R, &R::relayIp, &R::relayIpv6, &R::relayPort, &R::relaySessionKey,
                           &R::relaySessionId, &R::relayAccessToken, &R::relayProvider>;
};
/// Throws what the host refuses.
void admit(const DrelHoplineSelfAllocTokenArguments& arguments);
static_assert(DrelHoplineSelfAllocTokenArguments::Fields::check());

/// A self-allocation token: a relay and what opens a session on it.
struct DrelHoplineSelfAllocToken : DrelHoplineSelfAllocTokenArguments {
  using Arguments = DrelHoplineSelfAllocTokenArguments;

  [[nodiscard]] static DrelHoplineSelfAllocToken with(Arguments arguments) {
    return DrelHoplineSelfAllocToken([&] { return Arguments(std::move(arguments)); });
  }
  template <MakerOf<Arguments> Make>
  explicit DrelHoplineSelfAllocToken(Make&& make) : Arguments(make()) {
    admit(*this);
  }
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
/// Throws what the host refuses.
void admit(const DrelHoplinePluginAllocationArguments& arguments);
static_assert(DrelHoplinePluginAllocationArguments::Fields::check());

/// A plugin allocation of a message payload.
struct DrelHoplinePluginAllocation : DrelHoplinePluginAllocationArguments {
  using Arguments = DrelHoplinePluginAllocationArguments;

  [[nodiscard]] static DrelHoplinePluginAllocation with(Arguments arguments) {
    return DrelHoplinePluginAllocation([&] { return Arguments(std::move(arguments)); });
  }
  template <MakerOf<Arguments> Make>
  explicit DrelHoplinePluginAllocation(Make&& make) : Arguments(make()) {
    admit(*this);
  }
};

}  // namespace ironmoat
