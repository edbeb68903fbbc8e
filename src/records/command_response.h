#pragma once

#include "ironmoat/values.h"
#include "records/keyed_record.h"

namespace ironmoat {

/// The response to a command, as it comes: a top-level record.
struct VeskCommandResponseSchema {
  using CodingKeys = records::CodingKeys<VeskCommandResponseSchema>;

  Int command = 0;
  Optional<Int64> messageId;
  Optional<Data> messageUUID;
  Optional<Int> responseStatus;
  Optional<Int> failReason;
  Optional<Data> token;
  Optional<Bool> internalBuild;
  Optional<Bool> loggingProfile;
  Optional<String> applicationId;
  Optional<Int> requestType;
  Optional<Data> veskSessionId;
  Optional<Bool> sharedSession;
  Optional<Int> protocolVersion;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskCommandResponseSchema> {
  using R = VeskCommandResponseSchema;
  static constexpr KeyTable rows{
      row<&R::command>("c"),
      row<&R::messageId>("i"),
      row<&R::messageUUID>("U"),
      row<&R::responseStatus>("s"),
      row<&R::failReason>("fR"),
      row<&R::token>("t"),
      row<&R::internalBuild>("x-internal"),
      row<&R::loggingProfile>("x-logging"),
      row<&R::applicationId>("qai"),
      row<&R::requestType>("qat"),
      row<&R::veskSessionId>("qvesk"),
      row<&R::sharedSession>("qrss"),
      row<&R::protocolVersion>("qv"),
  };
};

}  // namespace ironmoat
