#pragma once

#include <concepts>
#include <cstdint>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "frames/record_codec.h"
#include "host/message_unpacker.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"
#include "values/unknown_keys.h"

namespace ironmoat {

namespace host {
class RequestLoop;
}

/// Serves unpack requests over the process's standard input and output: one connected stream
/// socket, or two pipes. doc/protocol.md specifies the protocol.
class IronmoatServer {
 public:
  /// The shared instance. It lives as long as the process.
  static IronmoatServer& service();

  enum class Sandboxed : std::uint8_t { yes, no };

  /// An unsandboxed server is for tests and measurements; clients reject it.
  explicit IronmoatServer(Sandboxed sandboxed = Sandboxed::yes) noexcept : sandboxed_(sandboxed) {}
  IronmoatServer(const IronmoatServer&) = delete;
  IronmoatServer& operator=(const IronmoatServer&) = delete;
  virtual ~IronmoatServer() = default;

  /// Binds an output type to its unpacker, and to the unpacker's `unknownKeys`, if it has them, the
  /// output type that asks for them. Must be called before `run`, once for each type.
  template <MessageSchema Output, MessageUnpacker Unpacker>
  requires std::same_as<typename Unpacker::MessageSchemaType, Output>
  void registerUnpacker(Unpacker unpacker) {
    add(std::string(Output::schemaName), [unpacker](const Data& message, BlockBuilder& reply) {
      frames::encodeRecord(unpacker.unpack(message), reply);
    });
    if constexpr (requires(const Data& message) { unpacker.unknownKeys(message); }) {
      add(unknownKeysOf(Output::schemaName), [unpacker](const Data& message, BlockBuilder& reply) {
        frames::encodeRecord(unpacker.unknownKeys(message), reply);
      });
    }
  }

  /// Sandboxes the process for good, then serves on the calling thread until the end of input.
  /// Also returns if the peer violates the protocol or stops reading. If a required part of the
  /// sandbox is unavailable, the process ends before it has read or written anything, with the exit
  /// status of that part (sandbox::statusWithout).
  virtual void run();

  /// Appends the whole reply frame to the frame body of a request. Throws nothing that a request
  /// causes. Thread-safe.
  void serve(const Data& request, BlockBuilder& reply) const;

 private:
  friend class host::RequestLoop;

  /// Unpacks the message and appends the record. Throws what the unpacker does.
  using Handler = std::function<void(const Data& message, BlockBuilder& reply)>;
  struct Registration {
    std::string outputType;
    Handler handler;
  };
  void add(std::string outputType, Handler handler);
  /// As `serve`, but throws std::bad_alloc if memory runs out and leaves `reply` as it was.
  void answer(const Data& request, BlockBuilder& reply) const;

  Sandboxed sandboxed_;
  std::vector<Registration> registrations_;
};

}  // namespace ironmoat
