#pragma once

#include <string_view>
#include <utility>

#include "ironmoat/output_record.h"

namespace ironmoat {

/// What DrelUserPayloadHttpHeaders is made with, in label order; `adhocServiceOverride` is labelled
/// `with`.
struct DrelUserPayloadHttpHeadersArguments {
  Optional<String> adhocServiceOverride;
  Optional<String> responseIdentifierString;
  Optional<String> strictTransportSecurity;
  Optional<String> traceId;
  Optional<String> splunkHint;
  Optional<String> asHttpHeader;

  using R = DrelUserPayloadHttpHeadersArguments;
  using Fields =
      FieldList<R, &R::adhocServiceOverride, &R::responseIdentifierString,
                &R::strictTransportSecurity, &R::traceId, &R::splunkHint, &R::asHttpHeader>;
};
/// Throws what the host refuses.
void admit(const DrelUserPayloadHttpHeadersArguments& arguments);
static_assert(DrelUserPayloadHttpHeadersArguments::Fields::check());

/// HTTP header values, each opaque text.
struct DrelUserPayloadHttpHeaders : DrelUserPayloadHttpHeadersArguments {
  using Arguments = DrelUserPayloadHttpHeadersArguments;

  [[nodiscard]] static DrelUserPayloadHttpHeaders with(Arguments arguments) {
    return DrelUserPayloadHttpHeaders([&] { return Arguments(std::move(arguments)); });
  }
  template <MakerOf<Arguments> Make>
  explicit DrelUserPayloadHttpHeaders(Make&& make) : Arguments(make()) {
    admit(*this);
  }
};

}  // namespace ironmoat
