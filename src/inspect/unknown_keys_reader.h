#pragma once

#include <optional>
#include <utility>

#include "client/context.h"
#include "client/pool.h"
#include "inspect/record_types.h"
#include "ironmoat/client_options.h"
#include "values/unknown_keys.h"

namespace ironmoat::inspect {

/// Asks a service process of its own for the unknown keys of messages.
class UnknownKeysReader {
 public:
  explicit UnknownKeysReader(ClientOptions options) : context_(std::move(options)) {}

  /// The unknown keys of the message that became `record`, with at most UnknownKeys::kMaxPaths
  /// paths; nothing if it has none. Untrusted like the record. Throws DecodingError, ServiceError
  /// and std::bad_alloc.
  std::optional<UnknownKeys> read(const AnyRecord& record, const Data& message);

 private:
  client::Context context_;
  client::Pool pool_{context_};
};

}  // namespace ironmoat::inspect
