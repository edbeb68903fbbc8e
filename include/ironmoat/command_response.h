#pragma once

#include <string_view>

#include "ironmoat/output_record.h"

namespace ironmoat {

/// What VeskCommandResponse is made with, in label order; `command` is labelled `with`.
struct VeskCommandResponseArguments {
  Int command = 0;
  Optional<Int64> messageId;   ///< of the message that this answers
  Optional<Data> messageUUID;  ///< of the message that this answers
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

  using R = VeskCommandResponseArguments;
  using Fields =
      FieldList<R, &R::command, &R::messageId, &R::messageUUID, &R::responseStatus, &R::failReason,
                &R::token, &R::internalBuild, &R::loggingProfile, &R::applicationId,
                &R::requestType, &R::veskSessionId, &R::sharedSession, &R::protocolVersion>;
};
IRONMOAT_API void admit(const VeskCommandResponseArguments& arguments);

/// The response to a command. Its fields are read as `response.command`, `response.token`, ...
struct IRONMOAT_API VeskCommandResponse
    : OutputRecord<VeskCommandResponse, VeskCommandResponseArguments> {
  using OutputRecord::OutputRecord;
  static constexpr std::string_view schemaName = "VeskCommandResponse";
};

}  // namespace ironmoat
