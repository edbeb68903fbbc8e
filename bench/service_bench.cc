// Measures the path through the client and the service's process, an echo of the same frames and
// sizes, and unpacking in this process. Measures wall time, because other threads and processes do
// most of the work. Must compile with older builds of the client, too (scripts/bench against).

#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <ctime>
#include <deque>
#include <filesystem>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "ironmoat/client.h"
#include "ironmoat/errors.h"
#include "ironmoat/limits.h"
#include "ironmoat/user_payload.h"
#include "messages.h"
#include "unpackers/corvel_payload_unpacker.h"

namespace ironmoat::bench {
namespace {

using benchmark::State;

constexpr char kEcho[] = ECHO_SERVICE;
constexpr char kService[] = SERVICE;

// Shared by a benchmark's threads: created before they start and destroyed after they have ended.
std::unique_ptr<Client> client;
std::vector<pid_t> neighbours;

Client::Options options(const char* program) {
  Client::Options options;
  options.program = program;
  return options;
}

Data typicalMessage() { return Data(messageOf(typicalPayload(0), plist::Format::binary).view()); }

void submitMany(const Data& message) {
  std::deque<Pending<DrelUserPayload>> inFlight;
  while (inFlight.size() < 64) inFlight.push_back(client->submit<DrelUserPayload>(message));
  for (auto& each : inFlight) benchmark::DoNotOptimize(each.get().command);
}

enum class Use { unpack, submit };

/// Replaces `client` by one whose services have worked for 50 ms, so that their start does not
/// count and the kernel has put them on processors of their own.
template <const char* program, Use use = Use::unpack>
void settle(const State& state) {
  using Clock = std::chrono::steady_clock;
  client = std::make_unique<Client>(options(program));
  const Data message = typicalMessage();
  const auto end = Clock::now() + std::chrono::milliseconds(50);
  std::vector<std::jthread> threads;
  for (int i = 0; i < state.threads(); ++i) {
    threads.emplace_back([&] {
      do {
        use == Use::unpack ? void(client->unpack<DrelUserPayload>(message)) : submitMany(message);
      } while (Clock::now() < end);
    });
  }
}

/// Starts as many processes with an endless loop as the benchmark's argument says.
void addNeighbours(const State& state) {
  for (int i = 0; i < state.range(0); ++i) {
    const pid_t child = ::fork();
    if (child == 0) {
      ::prctl(PR_SET_PDEATHSIG, SIGKILL);
      for (;;) benchmark::DoNotOptimize(child);
    }
    neighbours.push_back(child);
  }
}

void settleAmongNeighbours(const State& state) {
  addNeighbours(state);
  settle<kService>(state);
}

void leave(const State&) {
  client.reset();
  for (const pid_t child : neighbours) {
    ::kill(child, SIGKILL);
    ::waitpid(child, nullptr, 0);
  }
  neighbours.clear();
}

void inProcess(State& state) {
  const Data message = messageOf(typicalPayload(0), plist::Format::binary);
  for (auto _ : state) {
    auto record = VeskCorvelPayloadUnpacker().unpack(message);
    benchmark::DoNotOptimize(&record);
  }
}

void unpackAgainAndAgain(State& state, const Data& message) {
  for (auto _ : state) benchmark::DoNotOptimize(client->unpack<DrelUserPayload>(message).command);
}

void roundTrip(State& state) { unpackAgainAndAgain(state, typicalMessage()); }

void large(State& state) {
  VeskCorvelProtocolPayload record = typicalPayload(0);
  const auto size = static_cast<std::size_t>(state.range(0)) << 20;
  record.payload = Data(std::string(size - 4096, 'p'));  // leaves the message below its limit
  unpackAgainAndAgain(state, Data(messageOf(record, plist::Format::binary).view()));
}

void refused(State& state) {
  const VeskCorvelProtocolPayload record = typicalPayload(0);
  const Data message(messageOf(WrongAtLast{record}, plist::Format::binary).view());
  for (auto _ : state) {
    try {
      benchmark::DoNotOptimize(client->unpack<DrelUserPayload>(message).command);
    } catch (const DecodingError&) {
      continue;
    }
    throw std::logic_error("accepted what is wrong");
  }
}

/// Keeps as many requests of each thread in flight as the benchmark's argument says.
void pipelined(State& state) {
  const auto window = static_cast<std::size_t>(state.range(0));
  const Data message = typicalMessage();
  std::deque<Pending<DrelUserPayload>> inFlight;
  for (auto _ : state) {
    if (inFlight.size() == window) {
      benchmark::DoNotOptimize(inFlight.front().get().command);
      inFlight.pop_front();
    }
    inFlight.push_back(client->submit<DrelUserPayload>(message));
  }
  for (auto& each : inFlight) benchmark::DoNotOptimize(each.get().command);
}

/// A round trip to a process that echoes bytes, where both sides block without spinning.
void blockingEcho(State& state) {
  std::string bytes(typicalMessage().size(), 'b');
  int ends[2];
  if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0) {
    throw std::runtime_error("cannot make a socket pair");
  }
  const pid_t child = ::fork();
  if (child == 0) {
    ::close(ends[0]);
    while (::read(ends[1], bytes.data(), bytes.size()) > 0 &&
           ::write(ends[1], bytes.data(), bytes.size()) > 0) {
    }
    std::_Exit(0);
  }
  ::close(ends[1]);
  for (auto _ : state) {
    if (::write(ends[0], bytes.data(), bytes.size()) <= 0 ||
        ::read(ends[0], bytes.data(), bytes.size()) <= 0) {
      throw std::runtime_error("the echo is gone");
    }
  }
  ::close(ends[0]);
  ::waitpid(child, nullptr, 0);
}

/// Processor time of this process and its children, in nanoseconds.
double processorTime() {
  std::vector<pid_t> all = {::getpid()};
  for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
    std::ifstream children(task.path() / "children");
    for (pid_t child = 0; children >> child;) all.push_back(child);
  }
  double sum = 0;
  for (const pid_t process : all) {
    clockid_t clock = {};  // in nanoseconds; /proc/PID/stat has hundredths of a second
    timespec time = {};
    if (::clock_getcpuclockid(process, &clock) != 0 || ::clock_gettime(clock, &time) != 0) {
      throw std::runtime_error("cannot tell a process's processor time");
    }
    sum += static_cast<double>(time.tv_sec) * 1e9 + static_cast<double>(time.tv_nsec);
  }
  return sum;
}

/// Processor time of an idle client that has used both unpack and submit.
void idle(State& state) {
  submitMany(typicalMessage());
  const double last = processorTime();
  std::this_thread::sleep_for(std::chrono::seconds(2));  // the services clear their memory
  const double rested = processorTime();
  for (auto _ : state) std::this_thread::sleep_for(std::chrono::seconds(10));
  state.counters["going_to_rest"] = rested - last;
  state.counters["at_rest"] = processorTime() - rested;
}

/// Starts a process of the service's size, which finds its input at the end and exits.
void spawnAndWait(State& state) {
  for (auto _ : state) {
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", O_WRONLY, 0);
    char* arguments[] = {const_cast<char*>(kEcho), nullptr};
    pid_t child = 0;
    if (posix_spawn(&child, kEcho, &actions, nullptr, arguments, environ) != 0) {
      throw std::runtime_error("cannot spawn");
    }
    posix_spawn_file_actions_destroy(&actions);
    waitpid(child, nullptr, 0);
  }
}

void startToFirstReply(State& state, const char* program) {
  const Data message = typicalMessage();
  for (auto _ : state) {
    auto starting = std::make_unique<Client>(options(program));
    benchmark::DoNotOptimize(starting->unpack<DrelUserPayload>(message).command);
    state.PauseTiming();  // the end of the service does not count
    starting.reset();
    state.ResumeTiming();
  }
}

auto* add(const char* name, void (*function)(State&), void (*prepare)(const State&)) {
  return benchmark::RegisterBenchmark(name, function)
      ->Setup(prepare)
      ->Teardown(leave)
      ->UseRealTime();
}

const bool added = [] {
  add("roundTrip/echo", roundTrip, settle<kEcho>);
  add("roundTrip/service", roundTrip, settle<kService>)->Threads(1)->Threads(2)->Threads(4);
  add("refused", refused, settle<kService>);
  add("pipelined/echo", pipelined, settle<kEcho, Use::submit>)->Arg(64);
  add("pipelined/service", pipelined, settle<kService, Use::submit>)->Arg(64)->Arg(256);
  add("pipelined/two", pipelined, settle<kService, Use::submit>)->Arg(64)->Threads(2);
  add("large", large, settle<kService>)->Arg(1)->Arg(16);
  add("neighbours/service", roundTrip, settleAmongNeighbours)->Arg(0)->Arg(1)->Arg(2)->Arg(4);
  add("neighbours/blocking", blockingEcho, addNeighbours)->Arg(0)->Arg(1)->Arg(2)->Arg(4);
  add("idle", idle, settle<kService>)->Iterations(1)->Repetitions(1);
  return true;
}();

BENCHMARK(inProcess)->UseRealTime()->Threads(1)->Threads(2);
BENCHMARK(spawnAndWait)->UseRealTime();
BENCHMARK_CAPTURE(startToFirstReply, echo, ECHO_SERVICE)->UseRealTime();
BENCHMARK_CAPTURE(startToFirstReply, service, SERVICE)->UseRealTime();

}  // namespace
}  // namespace ironmoat::bench

BENCHMARK_MAIN();
