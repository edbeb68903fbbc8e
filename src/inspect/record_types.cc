#include "inspect/record_types.h"

#include <algorithm>
#include <array>

#include "inspect/json.h"
#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"

namespace ironmoat::inspect {

namespace {

template <MessageSchema R>
PendingRecord submitAs(Client& client, const Data& message) {
  return [pending = client.submit<R>(message).share()](Format format, const Colours& colours,
                                                       std::string& out) {
    const R& record = pending.get();
    if (format == Format::json) {
      appendJson(out, record);
    } else {
      TextView(out, colours).record(record, 2);
    }
  };
}

template <MessageSchema R>
constexpr RecordType row(std::string_view name) {
  return {name, submitAs<R>};
}

constexpr std::array kRecordTypes = {
    row<DrelUserPayload>("payload"),
    row<VeskCommandResponse>("command-response"),
    row<VeskCommandWebTunnelResponse>("web-tunnel-response"),
};

}  // namespace

std::span<const RecordType> recordTypes() noexcept { return kRecordTypes; }

const RecordType* recordType(std::string_view name) noexcept {
  const auto* found = std::find_if(kRecordTypes.begin(), kRecordTypes.end(),
                                   [name](const RecordType& type) { return type.name == name; });
  return found == kRecordTypes.end() ? nullptr : found;
}

}  // namespace ironmoat::inspect
