#include "ironmoat/errors.h"

namespace ironmoat {

std::string_view nameOf(DecodingError::Kind kind) noexcept {
  switch (kind) {
    case DecodingError::Kind::malformed:
      return "malformed";
    case DecodingError::Kind::limitExceeded:
      return "limitExceeded";
    case DecodingError::Kind::typeMismatch:
      return "typeMismatch";
    case DecodingError::Kind::outOfRange:
      return "outOfRange";
    case DecodingError::Kind::keyNotFound:
      return "keyNotFound";
    case DecodingError::Kind::rejectedByHost:
      return "rejectedByHost";
    case DecodingError::Kind::notEnoughMemory:
      return "notEnoughMemory";
  }
  return "unknown";
}

std::string_view nameOf(ServiceError::Kind kind) noexcept {
  switch (kind) {
    case ServiceError::Kind::crashed:
      return "crashed";
    case ServiceError::Kind::timedOut:
      return "timedOut";
    case ServiceError::Kind::unavailable:
      return "unavailable";
  }
  return "unknown";
}

}  // namespace ironmoat
