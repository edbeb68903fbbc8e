#pragma once

#include <functional>
#include <optional>

#include "host/connection.h"
#include "host/memory_turns.h"
#include "host/server.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::host {

/// One of the threads that serve: takes requests and adds their replies, until there are no more.
class Worker {
 public:
  Worker(const IronmoatServer& server, RequestSource& source, ReplySink& sink, MemoryTurns& turns)
      : server_(server), source_(source), sink_(sink), turns_(turns) {}
  Worker(const Worker&) = delete;
  Worker& operator=(const Worker&) = delete;

  /// Once. No other worker finds a request after it.
  void run();

 private:
  std::optional<Data> next();
  void reply(const Data& request);
  /// With the memory to itself, in which no reply waits.
  void replyAlone(const Data& request);
  void flush();

  const IronmoatServer& server_;
  RequestSource& source_;
  ReplySink& sink_;
  MemoryTurns& turns_;
  const std::function<void()> beforeWaiting_ = [this] { flush(); };
  BlockBuilder frame_{Sharing::oneThread};
};

}  // namespace ironmoat::host
