#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "inspect/record_types.h"
#include "ironmoat/errors.h"

namespace ironmoat::inspect {

/// The tool's exit status; of several, the highest counts.
enum ExitStatus : int {
  allUnpacked = 0,
  someRefused = 1,  ///< or the service failed over one
  cannotWork = 2,   ///< wrong usage, unreadable file, no service, output not writable
};

/// Why there is no record. `path` and `message` come from the service, which the sender may have
/// taken over.
struct Failure {
  std::string_view kind;
  std::string path;
  std::string message;
  std::optional<std::uint64_t> offset;  ///< into the message, which may be shorter
  ExitStatus status;

  friend bool operator==(const Failure&, const Failure&) = default;
};

Failure failureOf(const DecodingError& error);
Failure failureOf(const std::system_error& error);

struct Attempt {
  const RecordType* type;
  PendingRecord record;
};

/// What came of a message.
struct Outcome {
  const RecordType* type = nullptr;        ///< that accepted it
  std::unique_ptr<UnpackedRecord> record;  ///< if one did
  std::vector<std::string_view> asWell;    ///< types whose records got as much of it
  std::optional<Failure> failure;          ///< if there is no record
  struct Refusal {
    std::string_view type;
    Failure why;
  };
  std::vector<Refusal> refusals;  ///< where types refused it for different reasons: all of them

  [[nodiscard]] ExitStatus status() const { return failure ? failure->status : allUnpacked; }
};

/// Waits for all `attempts`, of which there is one at least. Of several records the one with the
/// most values is taken, of equals the first. That the service failed over an attempt is the
/// outcome, whatever came of the others: nothing is known of it.
Outcome outcomeOf(std::span<const Attempt> attempts);

}  // namespace ironmoat::inspect
