#pragma once

#include <string_view>
#include <utility>

#include "ironmoat/fields.h"
#include "ironmoat/values.h"

namespace ironmoat {

/// What VeskCommandResponse is made with, in label order; `command` is labelled `with`.
struct VeskCommandResponseArguments {
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

  using R = VeskCommandResponseArguments;
  using Fields =
      FieldList<R, &R::command, &R::messageId, &R::messageUUID, &R::responseStatus, &R::failReason,
                &R::token, &R::internalBuild, &R::loggingProfile, &R::applicationId,
                &R::requestType, &R::veskSessionId, &R::sharedSession, &R::protocolVersion>;
};
static_assert(VeskCommandResponseArguments::Fields::check());

/// The response to a command. Its fields are read as `response.command`, `response.token`, ...
struct VeskCommandResponse : VeskCommandResponseArguments {
  using Arguments = VeskCommandResponseArguments;
  static constexpr std::string_view schemaName = "VeskCommandResponse";

  /// The initialiser, and the only way to a record. Throws what the host refuses with.
  [[nodiscard]] static VeskCommandResponse with(Arguments arguments);

 private:
  explicit VeskCommandResponse(Arguments&& arguments) noexcept : Arguments(std::move(arguments)) {}
};

}  // namespace ironmoat
