// Time through the client and the service's process, beside an echo of the same frames and sizes,
// and of unpacking in this process. Wall time: most of it is spent in other threads.

#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>

#include <chrono>
#include <deque>
#include <memory>
#include <stdexcept>
#include <string>

#include "ironmoat/client.h"
#include "ironmoat/errors.h"
#include "ironmoat/user_payload.h"
#include "messages.h"
#include "unpackers/corvel_payload_unpacker.h"

extern char** environ;

namespace ironmoat::bench {
namespace {

Client::Options options(const char* program) {
  Client::Options options;
  options.program = program;
  return options;
}

Data typicalMessage() { return Data(messageOf(typicalPayload(0), plist::Form::binary).view()); }

/// Of a service that has been at work for a while: its start is measured by itself, and the kernel
/// may take 30 ms to put the two processes on two processors.
std::unique_ptr<Client> settledClient(const char* program) {
  using Clock = std::chrono::steady_clock;
  auto client = std::make_unique<Client>(options(program));
  const Data message = typicalMessage();
  const auto end = Clock::now() + std::chrono::milliseconds(50);
  while (Clock::now() < end) client->unpack<DrelUserPayload>(message);
  return client;
}

void inProcess(benchmark::State& state) {
  const Data message = messageOf(typicalPayload(0), plist::Form::binary);
  for (auto _ : state) {
    benchmark::DoNotOptimize(VeskCorvelPayloadUnpacker().unpack(message).command);
  }
}

void roundTrip(benchmark::State& state, const char* program) {
  const auto client = settledClient(program);
  const Data message = typicalMessage();
  for (auto _ : state) benchmark::DoNotOptimize(client->unpack<DrelUserPayload>(message).command);
}

void refused(benchmark::State& state, const char* program) {
  const auto client = settledClient(program);
  const VeskCorvelProtocolPayload record = typicalPayload(0);
  const Data message(messageOf(WrongAtLast{record}, plist::Form::binary).view());
  for (auto _ : state) {
    try {
      benchmark::DoNotOptimize(client->unpack<DrelUserPayload>(message).command);
    } catch (const DecodingError&) {
      continue;
    }
    throw std::logic_error("accepted what is wrong");
  }
}

/// Always `kInFlight` requests under way for each thread.
void pipelined(benchmark::State& state, const char* program) {
  constexpr std::size_t kInFlight = 64;
  static std::unique_ptr<Client> client;
  if (state.thread_index() == 0) client = settledClient(program);
  const Data message = typicalMessage();
  std::deque<Pending<DrelUserPayload>> inFlight;
  for (auto _ : state) {
    if (inFlight.size() == kInFlight) {
      benchmark::DoNotOptimize(inFlight.front().get().command);
      inFlight.pop_front();
    }
    inFlight.push_back(client->submit<DrelUserPayload>(message));
  }
  for (auto& each : inFlight) benchmark::DoNotOptimize(each.get().command);
  state.SetItemsProcessed(state.iterations());
}

/// A process of the same size that reads the end of its input at once and leaves.
void spawnAndWait(benchmark::State& state) {
  for (auto _ : state) {
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", O_WRONLY, 0);
    char* arguments[] = {const_cast<char*>(ECHO_SERVICE), nullptr};
    pid_t child = 0;
    if (posix_spawn(&child, ECHO_SERVICE, &actions, nullptr, arguments, environ) != 0) {
      throw std::runtime_error("cannot spawn");
    }
    posix_spawn_file_actions_destroy(&actions);
    waitpid(child, nullptr, 0);
  }
}

void startToFirstReply(benchmark::State& state, const char* program) {
  const Data message = typicalMessage();
  for (auto _ : state) {
    auto client = std::make_unique<Client>(options(program));
    benchmark::DoNotOptimize(client->unpack<DrelUserPayload>(message).command);
    state.PauseTiming();  // its end is not what is measured
    client.reset();
    state.ResumeTiming();
  }
}

BENCHMARK(inProcess)->UseRealTime();
BENCHMARK(inProcess)->Threads(2)->UseRealTime();
BENCHMARK_CAPTURE(roundTrip, echo, ECHO_SERVICE)->UseRealTime();
BENCHMARK_CAPTURE(roundTrip, service, SERVICE)->UseRealTime();
BENCHMARK_CAPTURE(refused, service, SERVICE)->Name("roundTrip/refused")->UseRealTime();
BENCHMARK_CAPTURE(pipelined, echo, ECHO_SERVICE)->UseRealTime();
BENCHMARK_CAPTURE(pipelined, service, SERVICE)->UseRealTime();
BENCHMARK_CAPTURE(pipelined, service, SERVICE)->Threads(2)->UseRealTime();
BENCHMARK(spawnAndWait)->UseRealTime();
BENCHMARK_CAPTURE(startToFirstReply, echo, ECHO_SERVICE)->UseRealTime();
BENCHMARK_CAPTURE(startToFirstReply, service, SERVICE)->UseRealTime();

}  // namespace
}  // namespace ironmoat::bench

BENCHMARK_MAIN();
