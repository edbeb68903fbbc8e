#pragma once

#include <concepts>
#include <functional>
#include <string_view>
#include <utility>
#include <vector>

#include "frames/record_codec.h"
#include "host/message_unpacker.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat {

/// Serves unpack requests over the process's standard input and output: one connected stream
/// socket, or two pipes. doc/frames.md describes what is spoken there.
class IronmoatServer {
 public:
  /// The shared instance. It lives as long as the process.
  static IronmoatServer& service();

  IronmoatServer() = default;
  IronmoatServer(const IronmoatServer&) = delete;
  IronmoatServer& operator=(const IronmoatServer&) = delete;
  virtual ~IronmoatServer() = default;

  /// Binds an output type to the unpacker that produces it. Before `run`, once for a type.
  template <MessageSchema Output, MessageUnpacker Unpacker>
  requires std::same_as<typename Unpacker::MessageSchemaType, Output>
  void registerUnpacker(Unpacker unpacker) {
    add(Output::schemaName, [unpacker](const Data& message, BlockBuilder& reply) {
      frames::encodeRecord(unpacker.unpack(message), reply);
    });
  }

  /// Serves until the end of input, on several threads, then returns once every reply is written.
  /// Also returns when the peer breaks the protocol or stops reading: there is nothing left to do.
  virtual void run();

  /// One request: the frame body of a request to the whole frame of its reply. Never throws for
  /// what a request says; any number of threads at once.
  void serve(const Data& request, BlockBuilder& reply) const;

 private:
  using Handler = std::function<void(const Data& message, BlockBuilder& reply)>;
  struct Registration {
    std::string_view outputType;
    Handler handler;
  };
  void add(std::string_view outputType, Handler handler);

  std::vector<Registration> registrations_;
};

}  // namespace ironmoat
