#pragma once

#include "ironmoat/values.h"
#include "records/keyed_record.h"

namespace ironmoat {

/// Under "Dc". Its "c" is a count, never the command of the payload around it.
struct VeskCorvelProtocolDeliveryContext {
  using CodingKeys = records::CodingKeys<VeskCorvelProtocolDeliveryContext>;

  Optional<Int> count;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskCorvelProtocolDeliveryContext> {
  using R = VeskCorvelProtocolDeliveryContext;
  static constexpr KeyTable rows{
      row<&R::count>("c"),
  };
};

/// An element of "qplr".
struct VeskHoplinePluginRequest {
  using CodingKeys = records::CodingKeys<VeskHoplinePluginRequest>;

  Optional<String> pluginName;
  Optional<String> pluginConfig;
  Optional<Int> pluginStream;
  Optional<Bool> pluginDevMode;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskHoplinePluginRequest> {
  using R = VeskHoplinePluginRequest;
  static constexpr KeyTable rows{
      row<&R::pluginName>("qpln"),
      row<&R::pluginConfig>("qplc"),
      row<&R::pluginStream>("qpls"),
      row<&R::pluginDevMode>("qpld"),
  };
};

/// An element of "qal".
struct VeskHoplineAllocationStatus {
  using CodingKeys = records::CodingKeys<VeskHoplineAllocationStatus>;

  Optional<Int64> participantId;
  Optional<Int> allocationStatus;
  Optional<Data> token;
  Optional<String> destinationId;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskHoplineAllocationStatus> {
  using R = VeskHoplineAllocationStatus;
  static constexpr KeyTable rows{
      row<&R::participantId>("qri"),
      row<&R::allocationStatus>("qrs"),
      row<&R::token>("t"),
      row<&R::destinationId>("tP"),
  };
};

/// An element of "qsatv".
struct VeskHoplineSelfAllocToken {
  using CodingKeys = records::CodingKeys<VeskHoplineSelfAllocToken>;

  Optional<Data> relayIp;
  Optional<Data> relayIpv6;
  Optional<Int> relayPort;
  Optional<Data> relaySessionKey;
  Optional<Data> relaySessionId;
  Optional<Data> relayAccessToken;
  Optional<Int> relayProvider;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskHoplineSelfAllocToken> {
  using R = VeskHoplineSelfAllocToken;
  static constexpr KeyTable rows{
      row<&R::relayIp>("qrip"),        row<&R::relayIpv6>("qrip6"),
      row<&R::relayPort>("qrp"),       row<&R::relaySessionKey>("qrsk"),
      row<&R::relaySessionId>("qrsi"), row<&R::relayAccessToken>("qrst"),
      row<&R::relayProvider>("qrpr"),
  };
};

/// An element of "qpla".
struct VeskHoplinePluginAllocation {
  using CodingKeys = records::CodingKeys<VeskHoplinePluginAllocation>;

  Optional<String> pluginName;
  Optional<Int> pluginStream;
  Optional<Int64> participantId;
  Optional<Data> relaySessionKey;
  Optional<Data> relayAccessToken;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskHoplinePluginAllocation> {
  using R = VeskHoplinePluginAllocation;
  static constexpr KeyTable rows{
      row<&R::pluginName>("qpln"),       row<&R::pluginStream>("qpls"),
      row<&R::participantId>("qri"),     row<&R::relaySessionKey>("qrsk"),
      row<&R::relayAccessToken>("qrst"),
  };
};

}  // namespace ironmoat
