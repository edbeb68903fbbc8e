#pragma once

#include <string_view>

#include "ironmoat/http_headers.h"
#include "ironmoat/output_record.h"

namespace ironmoat {

/// What VeskCommandWebTunnelResponse is made with, in label order; `command` is labelled `with`.
struct VeskCommandWebTunnelResponseArguments {
  Int command = 0;
  Optional<Int> messageId;
  Optional<Data> messageUUID;
  Optional<Int> responseStatus;
  Optional<String> contentType;
  Optional<Int64> epochTimeNanos;  ///< nanoseconds since the epoch
  Optional<String> httpUrl;
  Optional<DrelUserPayloadHttpHeaders> httpHeaders;
  Optional<Data> httpBody;
  Optional<String> httpBodyUrl;      ///< where the body is, if it is not in httpBody
  Optional<Data> httpBodyKey;        ///< key of the body at httpBodyUrl
  Optional<Int> httpResponseStatus;  ///< HTTP status code; responseStatus is that of the command
  Optional<String> httpErrorMsg;

  using R = VeskCommandWebTunnelResponseArguments;
  using Fields =
      FieldList<R, &R::command, &R::messageId, &R::messageUUID, &R::responseStatus, &R::contentType,
                &R::epochTimeNanos, &R::httpUrl, &R::httpHeaders, &R::httpBody, &R::httpBodyUrl,
                &R::httpBodyKey, &R::httpResponseStatus, &R::httpErrorMsg>;
};
IRONMOAT_API void admit(const VeskCommandWebTunnelResponseArguments& arguments);

/// The response to a web-tunnel command: an HTTP exchange beside the fields of a response.
struct IRONMOAT_API VeskCommandWebTunnelResponse
    : OutputRecord<VeskCommandWebTunnelResponse, VeskCommandWebTunnelResponseArguments> {
  using OutputRecord::OutputRecord;
  static constexpr std::string_view schemaName = "VeskCommandWebTunnelResponse";
};

}  // namespace ironmoat
