#pragma once

#include <concepts>
#include <cstdint>
#include <functional>
#include <string_view>
#include <utility>
#include <vector>

#include "frames/record_codec.h"
#include "host/message_unpacker.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat {

namespace host {
class RequestLoop;
}

/// Serves unpack requests over the process's standard input and output: one connected stream
/// socket, or two pipes. doc/frames.md describes what is spoken there.
class IronmoatServer {
 public:
  /// The shared instance. It lives as long as the process.
  static IronmoatServer& service();

  enum class Confine : std::uint8_t { yes, no };

  /// An unconfined server is for tests and measurements; clients refuse it.
  explicit IronmoatServer(Confine confine = Confine::yes) noexcept : confine_(confine) {}
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

  /// Sandboxes the process for good, then serves on the calling thread until the end of input.
  /// Also returns when the peer breaks the protocol or stops reading. Where the sandbox is not to
  /// be had, the process ends with an exit status that says which part (frames::lackToldBy); it has
  /// then read and written nothing.
  virtual void run();

  /// One request: the frame body of a request to the whole frame of its reply. Never throws for
  /// what a request says; any number of threads at once.
  void serve(const Data& request, BlockBuilder& reply) const;

 private:
  friend class host::RequestLoop;

  /// Unpacks the message and appends the record. Throws what the unpacker does.
  using Handler = std::function<void(const Data& message, BlockBuilder& reply)>;
  struct Registration {
    std::string_view outputType;
    Handler handler;
  };
  void add(std::string_view outputType, Handler handler);
  /// As `serve`, but throws std::bad_alloc where memory runs out; `reply` is as it was then.
  void answer(const Data& request, BlockBuilder& reply) const;

  Confine confine_;
  std::vector<Registration> registrations_;
};

}  // namespace ironmoat
