#pragma once

#include "client/counters.h"
#include "client/fork_mark.h"
#include "client/request.h"

namespace ironmoat::client {

/// Fails a request that no process is to see: one of a forked child, or with a message over the
/// limit. Returns whether it did.
bool failsEarly(Request& request, const ForkMark& forkMark, Counters& counters);

}  // namespace ironmoat::client
