// VeskIronmoatService: seven steps without a branch, then the host takes the process over. Reads no
// command line, environment or configuration, and writes only frames. If the sandbox or an abort
// kills the process, one line on standard error says why.

#include "host/server.h"
#include "service/preferences_store.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"

namespace {
/// Held from start-up for the life of the process.
ironmoat::IronmoatServer* server = nullptr;
}  // namespace

int main() {
  using namespace ironmoat;
  PreferencesStore::enableDirectMode(true);
  PreferencesStore::enableReadOnlyMode(true);
  server = &IronmoatServer::service();
  server->registerUnpacker<DrelUserPayload>(VeskCorvelPayloadUnpacker());
  server->registerUnpacker<VeskCommandResponse>(VeskCommandResponseUnpacker());
  server->registerUnpacker<VeskCommandWebTunnelResponse>(VeskCommandWebTunnelResponseUnpacker());
  server->run();
  return 0;
}
