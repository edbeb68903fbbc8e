#include "client/early_failure.h"

#include <string>
#include <utility>

#include "ironmoat/limits.h"

namespace ironmoat::client {

bool failsEarly(Request& request, const ForkMark& forkMark, Counters& counters) {
  const std::size_t size = request.message().size();
  if (!forkMark.inCopy() && size <= limits::messageBytes) return false;
  Failure failure = ServiceError(ServiceError::Kind::unavailable,
                                 "this client belongs to the process that forked this one");
  if (size > limits::messageBytes) {
    failure = DecodingError(DecodingError::Kind::limitExceeded, "",
                            "message of " + std::to_string(size) + " bytes exceeds the limit of " +
                                std::to_string(limits::messageBytes));
  }
  counters.count(&failure);
  request.fail(std::move(failure));
  return true;
}

}  // namespace ironmoat::client
