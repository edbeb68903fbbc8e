// Measures round trips to another process that parses one typical message, from raw bytes to a
// record: through this client, and in two usual ways: a forked process that reads protobuf from a
// pipe, and gRPC over a Unix socket. Neither of these has a sandbox.

#include <benchmark/benchmark.h>
#include <google/protobuf/arena.h>
#include <grpcpp/grpcpp.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <stdexcept>
#include <string>

#include "ironmoat/client.h"
#include "ironmoat/user_payload.h"
#include "messages.h"
#include "protobuf_peer.h"
#include "records.pb.h"
#include "rpc.grpc.pb.h"

namespace ironmoat::bench {
namespace {

using benchmark::State;
using google::protobuf::Arena;
using Payload = peer::VeskCorvelProtocolPayload;

/// Runs `serve` in a child process that ends with this one.
template <class Serve>
pid_t forked(const Serve& serve) {
  const pid_t child = ::fork();
  if (child != 0) return child;
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  serve();
  std::_Exit(0);
}

/// Sends and receives messages, each after its length, over a pipe for each direction.
class Pipe {
 public:
  Pipe() {
    if (::pipe(ends_) != 0) throw std::runtime_error("cannot make a pipe");
  }
  void write(const std::string& message) {
    const auto size = static_cast<std::uint32_t>(message.size());
    frame_.assign(reinterpret_cast<const char*>(&size), sizeof size).append(message);
    if (::write(ends_[1], frame_.data(), frame_.size()) != static_cast<ssize_t>(frame_.size())) {
      std::abort();
    }
  }
  /// Returns false at the end of the input.
  bool read(std::string& message) {
    frame_.resize(std::size_t{64} << 10);  // a message of the benchmark is shorter
    const ssize_t count = ::read(ends_[0], frame_.data(), frame_.size());
    if (count <= 0) return false;
    message.assign(frame_.data(), static_cast<std::size_t>(count)).erase(0, sizeof(std::uint32_t));
    return true;
  }

 private:
  int ends_[2] = {};
  std::string frame_;
};

void service(State& state) {
  Client::Options options;
  options.program = SERVICE;
  Client client(options);
  const Data message(messageOf(typicalPayload(0), plist::Format::binary).view());
  for (auto _ : state) benchmark::DoNotOptimize(client.unpack<DrelUserPayload>(message).command);
}

Pipe requests;
Pipe replies;

// The servers are forked before this process has threads.

const pid_t forkServer = forked([] {
  for (std::string bytes; requests.read(bytes);) {
    Arena arena;
    auto* const record = Arena::CreateMessage<Payload>(&arena);
    if (!record->ParseFromString(bytes)) std::abort();
    replies.write(record->SerializeAsString());
  }
});

void protobufOverPipes(State& state) {
  const std::string message = protobufOf(typicalPayload(0));
  std::string bytes;
  for (auto _ : state) {
    requests.write(message);
    if (!replies.read(bytes)) throw std::runtime_error("the fork server is gone");
    benchmark::DoNotOptimize(parseProtobufInArena(bytes));
  }
}

class Parser final : public peer::Parser::Service {
  grpc::Status Parse(grpc::ServerContext*, const peer::Bytes* request, Payload* record) override {
    return record->ParseFromString(request->message())
               ? grpc::Status::OK
               : grpc::Status(grpc::StatusCode::INVALID_ARGUMENT, "");
  }
};

std::string socketPath() { return "unix:/tmp/rpc_bench." + std::to_string(::getpid()); }

const pid_t grpcServer = [] {
  const std::string path = socketPath();
  return forked([&] {
    Parser parser;
    grpc::ServerBuilder builder;
    builder.AddListeningPort(path, grpc::InsecureServerCredentials());
    builder.RegisterService(&parser);
    builder.BuildAndStart()->Wait();
  });
}();

void grpcOverUnixSocket(State& state) {
  const auto channel = grpc::CreateChannel(socketPath(), grpc::InsecureChannelCredentials());
  const auto stub = peer::Parser::NewStub(channel);
  peer::Bytes request;
  request.set_message(protobufOf(typicalPayload(0)));
  for (auto _ : state) {
    grpc::ClientContext context;
    context.set_wait_for_ready(true);
    Payload record;
    if (!stub->Parse(&context, request, &record).ok()) throw std::runtime_error("gRPC failed");
    benchmark::DoNotOptimize(record.command());
  }
}

BENCHMARK(service)->Name("rpc/service")->UseRealTime();
BENCHMARK(protobufOverPipes)->Name("rpc/protobufOverPipes")->UseRealTime();
BENCHMARK(grpcOverUnixSocket)->Name("rpc/grpcOverUnixSocket")->UseRealTime();

}  // namespace
}  // namespace ironmoat::bench

BENCHMARK_MAIN();
