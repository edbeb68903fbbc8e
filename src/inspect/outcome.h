#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "inspect/record_types.h"
#include "ironmoat/errors.h"
#include "values/unknown_keys.h"

namespace ironmoat::inspect {

/// The tool's exit status. Of several, the highest counts, but unknownKeysFound replaces only
/// allUnpacked.
enum ExitStatus : int {
  allUnpacked = 0,
  someRejected = 1,  ///< or the service failed on one
  cannotWork = 2,    ///< wrong usage, unreadable file, no service, output not writable
  unknownKeysFound = 3,
};

/// The reason why there is no record. `path` and `description` are untrusted, because a compromised
/// service can forge them.
struct Failure {
  std::string_view kind;
  std::string path;
  std::string description;
  std::optional<std::uint64_t> offset;  ///< in the message; untrusted, may exceed its size
  ExitStatus status;

  friend bool operator==(const Failure&, const Failure&) = default;
};

Failure failureOf(const DecodingError& error);
Failure failureOf(const ServiceError& error);
Failure failureOf(const std::system_error& error);

/// What a message became: a record or a failure.
struct Outcome {
  struct Rejection {
    std::string_view type;
    Failure why;
  };

  std::optional<AnyRecord> record;
  std::vector<std::string_view> types;     ///< of the record, then those that fit equally well
  std::optional<UnknownKeys> unknownKeys;  ///< if requested, and there are any
  std::optional<Failure> failure;
  std::vector<Rejection> rejections;  ///< of all types, if their reasons differ

  [[nodiscard]] ExitStatus status() const { return failure ? failure->status : allUnpacked; }
};

struct Attempt {
  std::string_view type;
  Types::Pending record;
};

/// Waits for all `attempts`; requires at least one. Returns the record with the most values, the
/// first of equals. If the service failed on an attempt, returns that failure, also if others
/// succeeded.
Outcome outcomeOf(std::vector<Attempt>& attempts);

}  // namespace ironmoat::inspect
