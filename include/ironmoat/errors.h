#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>

#include "ironmoat/api.h"

namespace ironmoat {

/// A message was rejected. The same bytes always give the same error, so that retrying is useless.
/// The one exception is `notEnoughMemory`, which also depends on the machine.
///
/// `what()` is a description for people. A service never repeats the sender's text in it or in
/// `path()`, but a compromised one may send anything: escape both for a terminal or a log.
class IRONMOAT_API DecodingError : public std::runtime_error {
 public:
  enum class Kind : std::uint8_t {
    malformed,        ///< the bytes are no property list; `offset()` says where
    limitExceeded,    ///< over one of ironmoat/limits.h
    typeMismatch,     ///< a value of the wrong kind
    outOfRange,       ///< an integer that does not fit its field
    keyNotFound,      ///< a required key is missing
    rejectedByHost,   ///< an output record's initialiser threw; `what()` is its description
    notEnoughMemory,  ///< decoding took more memory than the service has; see
                      ///< `Stats::limitedMemory`
  };

  DecodingError(Kind kind, std::string path, const std::string& message,
                std::optional<std::uint64_t> offset = std::nullopt)
      : std::runtime_error(message), kind_(kind), path_(std::move(path)), offset_(offset) {}

  [[nodiscard]] Kind kind() const noexcept { return kind_; }
  /// Where, in wire keys: `mml[1].dtl[0].U`; empty for the message itself; for a missing key the
  /// path that it would have.
  [[nodiscard]] const std::string& path() const noexcept { return path_; }
  /// Byte of the message at which it stops being a property list; for any other error where the
  /// value at fault begins, which for a missing key is the dictionary without it. None where no one
  /// place is at fault: the message is too long, nested too deep, or takes too much memory.
  [[nodiscard]] std::optional<std::uint64_t> offset() const noexcept { return offset_; }

 private:
  Kind kind_;
  std::string path_;
  std::optional<std::uint64_t> offset_;
};

/// No answer could be had about a message: nothing is known of its bytes.
class IRONMOAT_API ServiceError : public std::runtime_error {
 public:
  enum class Kind : std::uint8_t {
    crashed,      ///< the service died over this request
    timedOut,     ///< no reply within the deadline
    unavailable,  ///< no service could be started or reached, or this one does not serve the
                  ///< request: an output type it does not know
  };

  ServiceError(Kind kind, const std::string& message) : std::runtime_error(message), kind_(kind) {}
  [[nodiscard]] Kind kind() const noexcept { return kind_; }

 private:
  Kind kind_;
};

/// The enumerator's own name, as in `typeMismatch`.
IRONMOAT_API std::string_view nameOf(DecodingError::Kind kind) noexcept;
IRONMOAT_API std::string_view nameOf(ServiceError::Kind kind) noexcept;

}  // namespace ironmoat
