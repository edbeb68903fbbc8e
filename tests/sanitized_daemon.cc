// A daemon built with ThreadSanitizer that uses the library as it is installed: the sanitizer must
// not report what the library synchronises. Takes the service's path.

#include <chrono>
#include <cstdlib>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ironmoat/client.h"
#include "ironmoat/command_response.h"

int main(int, char** arguments) {
  using namespace ironmoat;
  std::mutex mutex;
  std::vector<VeskCommandResponse> kept;
  const auto keep = [&](Outcome<VeskCommandResponse> outcome) {
    const std::lock_guard lock(mutex);
    if (kept.size() == 30) kept.clear();
    if (outcome) kept.push_back(*std::move(outcome));
  };
  Client::Options options;
  options.program = arguments[1];
  Client client(options);
  std::vector<Pending<VeskCommandResponse>> pending;
  for (int i = 0; i < 400; ++i) {
    const std::string text = "<plist><dict><key>c</key><integer>1</integer><key>qai</key><string>" +
                             std::to_string(i) + (i % 7 == 0 ? "" : "</string></dict></plist>");
    pending.push_back(client.submit<VeskCommandResponse>(Data(text)));
    client.submit<VeskCommandResponse>(Data(text), keep);
  }
  std::vector<std::jthread> threads;
  for (std::size_t thread = 0; thread < 4; ++thread) {
    threads.emplace_back([&, thread] {
      for (std::size_t i = thread; i < pending.size(); i += 4) {
        while (pending[i].wait_for(std::chrono::seconds(0)) != std::future_status::ready) {
          keep(client.tryUnpack<VeskCommandResponse>(Data(std::string_view("junk"))));
        }
        keep(pending[i].outcome());
      }
    });
  }
  return EXIT_SUCCESS;
}
