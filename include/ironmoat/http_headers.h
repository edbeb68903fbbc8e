#pragma once

#include "ironmoat/output_record.h"

namespace ironmoat {

/// What DrelUserPayloadHttpHeaders is made with, in label order; `adhocServiceOverride` is labelled
/// `with`.
struct DrelUserPayloadHttpHeadersArguments {
  Optional<String> adhocServiceOverride;
  Optional<String> responseIdentifierString;
  Optional<String> strictTransportSecurity;  ///< header strict-transport-security
  Optional<String> traceId;                  ///< header x-b3-traceid
  Optional<String> splunkHint;
  Optional<String> asHttpHeader;

  using R = DrelUserPayloadHttpHeadersArguments;
  using Fields =
      FieldList<R, &R::adhocServiceOverride, &R::responseIdentifierString,
                &R::strictTransportSecurity, &R::traceId, &R::splunkHint, &R::asHttpHeader>;
};
IRONMOAT_API void admit(const DrelUserPayloadHttpHeadersArguments& arguments);

/// HTTP header values, each opaque text.
struct DrelUserPayloadHttpHeaders
    : OutputRecord<DrelUserPayloadHttpHeaders, DrelUserPayloadHttpHeadersArguments> {
  using OutputRecord::OutputRecord;
};

}  // namespace ironmoat
