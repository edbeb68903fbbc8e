#include "client/settings.h"

#include <algorithm>
#include <thread>
#include <utility>

#include "client/default_program.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {

constexpr std::size_t kDefaultProcesses = 4;
constexpr std::size_t kMaxProcesses = 256;

std::size_t validProcesses(std::size_t wanted) noexcept {
  if (wanted != 0) return std::min(wanted, kMaxProcesses);
  const std::size_t processors = std::thread::hardware_concurrency();
  return std::clamp<std::size_t>(processors, 1, kDefaultProcesses);
}

}  // namespace

Clock::duration validDeadline(std::chrono::milliseconds deadline) noexcept {
  return std::clamp<std::chrono::milliseconds>(deadline, 1ms, 24h);
}

Settings::Settings(ClientOptions options)
    : program(options.program.empty() ? defaultProgram() : std::move(options.program)),
      deadline(validDeadline(options.deadline)),
      processes(validProcesses(options.processes)),
      idleTime(std::clamp<std::chrono::milliseconds>(options.idleTime, 0ms, 24h)),
      requestsPerProcess(std::max<std::uint64_t>(options.requestsPerProcess, 1)),
      processLifetime(std::clamp<std::chrono::seconds>(options.processLifetime, 1s, 24h * 365)),
      maxBytesInFlight(options.maxBytesInFlight) {}

}  // namespace ironmoat::client
