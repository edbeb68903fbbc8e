#include "client/settings.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <thread>

#include "process/program.h"

namespace ironmoat::client {

using namespace std::chrono_literals;

namespace {

constexpr std::size_t kDefaultProcesses = 4;
constexpr std::size_t kMaxProcesses = 256;

}  // namespace

std::chrono::milliseconds validDeadline(std::chrono::milliseconds deadline) noexcept {
  return std::clamp<std::chrono::milliseconds>(deadline, 1ms, 24h);
}

ClientOptions settingsFrom(ClientOptions options) {
  if (options.program.empty()) options.program = process::defaultProgram();
  options.deadline = validDeadline(options.deadline);
  if (options.processes == 0) {
    const std::size_t processors = std::thread::hardware_concurrency();
    options.processes = std::clamp<std::size_t>(processors, 1, kDefaultProcesses);
  }
  options.processes = std::min(options.processes, kMaxProcesses);
  options.idleTime = std::clamp<std::chrono::milliseconds>(options.idleTime, 0ms, 24h);
  options.requestsPerProcess = std::max<std::uint64_t>(options.requestsPerProcess, 1);
  options.processLifetime =
      std::clamp<std::chrono::seconds>(options.processLifetime, 1s, 24h * 365);
  return options;
}

}  // namespace ironmoat::client
