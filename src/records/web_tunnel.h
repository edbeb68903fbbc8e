#pragma once

#include "ironmoat/values.h"
#include "records/keyed_record.h"

namespace ironmoat {

/// HTTP header values, each opaque text; nested under "h".
struct VeskCorvelProtocolHttpHeaders {
  using CodingKeys = records::CodingKeys<VeskCorvelProtocolHttpHeaders>;

  Optional<String> adhocServiceOverride;
  Optional<String> responseIdentifierString;
  Optional<String> strictTransportSecurity;
  Optional<String> traceId;
  Optional<String> splunkHint;
  Optional<String> asHttpHeader;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskCorvelProtocolHttpHeaders> {
  using R = VeskCorvelProtocolHttpHeaders;
  static constexpr KeyTable rows{
      row<&R::adhocServiceOverride>("aS"),
      row<&R::responseIdentifierString>("ri"),
      row<&R::strictTransportSecurity>("strict-transport-security"),
      row<&R::traceId>("x-b3-traceid"),
      row<&R::splunkHint>("sh"),
      row<&R::asHttpHeader>("as"),
  };
};

/// The response to a web-tunnel command, as it comes: a top-level record.
struct VeskCommandWebTunnelResponseSchema {
  using CodingKeys = records::CodingKeys<VeskCommandWebTunnelResponseSchema>;

  Int command = 0;
  Optional<Int> messageId;
  Optional<Data> messageUUID;
  Optional<Int> responseStatus;
  Optional<String> contentType;
  Optional<Int64> epochTimeNanos;
  Optional<String> httpUrl;
  Optional<VeskCorvelProtocolHttpHeaders> httpHeaders;
  Optional<Data> httpBody;
  Optional<String> httpBodyUrl;
  Optional<Data> httpBodyKey;
  Optional<Int> httpResponseStatus;
  Optional<String> httpErrorMsg;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskCommandWebTunnelResponseSchema> {
  using R = VeskCommandWebTunnelResponseSchema;
  static constexpr KeyTable rows{
      row<&R::command>("c"),        row<&R::messageId>("i"),    row<&R::messageUUID>("U"),
      row<&R::responseStatus>("s"), row<&R::contentType>("cT"), row<&R::epochTimeNanos>("e"),
      row<&R::httpUrl>("u"),        row<&R::httpHeaders>("h"),  row<&R::httpBody>("b"),
      row<&R::httpBodyUrl>("bu"),   row<&R::httpBodyKey>("bk"), row<&R::httpResponseStatus>("hs"),
      row<&R::httpErrorMsg>("hr"),
  };
};

}  // namespace ironmoat
