#pragma once

#include <utility>

#include "client/counters.h"
#include "client/fork_mark.h"
#include "client/pool.h"
#include "client/settings.h"
#include "client/shared_engine.h"

namespace ironmoat::client {

/// What the threads that use a Client share.
struct Core {
  explicit Core(ClientOptions options)
      : settings(std::move(options)), pool(settings, counters), engine(settings, counters) {
    forkMark.set();
  }

  const Settings settings;
  Counters counters;
  ForkMark forkMark;
  Pool pool;
  SharedEngine engine;
};

}  // namespace ironmoat::client
