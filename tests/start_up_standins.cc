// Linked with the service's own main instead of the preferences store and the server: says what
// main does, one line a step.

#include <cstdio>
#include <string_view>
#include <typeinfo>

#include "host/server.h"
#include "service/preferences_store.h"

namespace ironmoat {

void PreferencesStore::enableDirectMode(bool enabled) { std::printf("direct mode %d\n", enabled); }
void PreferencesStore::enableReadOnlyMode(bool enabled) {
  std::printf("read-only mode %d\n", enabled);
}

IronmoatServer& IronmoatServer::service() {
  std::puts("shared server read");
  static IronmoatServer server;
  return server;
}

void IronmoatServer::add(std::string_view outputType, Handler handler) {
  const std::string_view unpacker = handler.target_type().name();
  std::printf("registered %.*s:", static_cast<int>(outputType.size()), outputType.data());
  for (const char* known : {"VeskCorvelPayloadUnpacker", "VeskCommandResponseUnpacker",
                            "VeskCommandWebTunnelResponseUnpacker"}) {
    if (unpacker.find(known) != std::string_view::npos) std::printf(" %s", known);
  }
  std::puts("");
}

void IronmoatServer::run() { std::puts("run"); }

}  // namespace ironmoat
