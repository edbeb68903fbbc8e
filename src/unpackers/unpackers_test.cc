// The three conversions, with stand-ins for the output records' initialisers that write down each
// call and refuse on demand.

#include <gtest/gtest.h>

#include <concepts>
#include <string>
#include <vector>

#include "plist/encoder.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "support/refusal.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"

namespace ironmoat {
namespace {

struct Refusal {
  std::string call;
};

std::vector<std::string> calls;
std::string refused;  // the call that the host refuses

/// A call as "type argument", where the argument is the first one.
void note(const std::string& type, const std::string& argument) {
  calls.push_back(type + " " + argument);
  if (calls.back() == refused) throw Refusal{refused};
}
template <class T>
std::string show(const T& value) {
  if constexpr (std::integral<T>) return std::to_string(value);
  if constexpr (requires { value.view(); }) return std::string(value.view());
  if constexpr (requires { value.has_value(); }) return value ? show(*value) : "-";
}

std::string joined() {
  std::string all;
  for (const std::string& call : calls) all += call + "; ";
  return all;
}

}  // namespace

void admit(const VeskCommandResponseArguments& arguments) {
  note("response", show(arguments.command));
}
void admit(const VeskCommandWebTunnelResponseArguments& arguments) {
  note("tunnel", show(arguments.command));
}
void admit(const DrelUserPayloadHttpHeadersArguments& arguments) {
  note("headers", show(arguments.adhocServiceOverride));
}
void admit(const DrelUserPayloadDeliveryContextArguments& arguments) {
  note("context", show(arguments.count));
}
void admit(const DrelHoplinePluginRequestArguments& arguments) {
  note("request", show(arguments.pluginName));
}
void admit(const DrelHoplineAllocationStatusArguments& arguments) {
  note("status", show(arguments.participantId));
}
void admit(const DrelHoplineSelfAllocTokenArguments& arguments) {
  note("token", show(arguments.relayIp));
}
void admit(const DrelHoplinePluginAllocationArguments& arguments) {
  note("allocation", show(arguments.pluginName));
}
void admit(const DrelUserPayloadArguments& arguments) { note("payload", show(arguments.command)); }

namespace {

template <class R>
Data messageOf(const R& record) {
  return plist::PropertyListEncoder(plist::Form::binary).encode(record);
}
/// A record with one field present.
template <class R, class T>
R with(Optional<T> R::*field, T value) {
  R record;
  record.*field = std::move(value);
  return record;
}
VeskCorvelProtocolPayload payload(Int command) {
  VeskCorvelProtocolPayload record;
  record.command = command;
  return record;
}

/// Payload 1 with everything nested in it, down to payloads in payloads.
VeskCorvelProtocolPayload tree() {
  VeskCorvelProtocolPayload inner = payload(21);
  inner.httpHeaders = with(&VeskCorvelProtocolHttpHeaders::adhocServiceOverride, String("inner"));
  VeskCorvelProtocolPayload first = payload(31);
  first.dstIdTokenList = List<VeskCorvelProtocolPayload>{inner};
  VeskCorvelProtocolPayload top = payload(1);
  top.corvelMessageList = List<VeskCorvelProtocolPayload>{first, payload(32)};
  top.dstIdTokenList = List<VeskCorvelProtocolPayload>{payload(11), payload(12)};
  top.httpHeaders = VeskCorvelProtocolHttpHeaders();
  top.deliveryContext = with(&VeskCorvelProtocolDeliveryContext::count, Int{3});
  top.pluginAllocations = List<VeskHoplinePluginAllocation>{
      with(&VeskHoplinePluginAllocation::pluginName, String("pa"))};
  top.selfAllocTokenList =
      List<VeskHoplineSelfAllocToken>{with(&VeskHoplineSelfAllocToken::relayIp, Data("ip"))};
  top.allocationStatuses =
      List<VeskHoplineAllocationStatus>{with(&VeskHoplineAllocationStatus::participantId, Int64{1}),
                                        with(&VeskHoplineAllocationStatus::participantId, Int64{2}),
                                        {}};
  top.pluginRequests =
      List<VeskHoplinePluginRequest>{with(&VeskHoplinePluginRequest::pluginName, String("pr"))};
  return top;
}

class UnpackersTest : public ::testing::Test {
 protected:
  void SetUp() override {
    calls.clear();
    refused.clear();
  }
};

TEST_F(UnpackersTest, ChildrenComeBeforeParentsInTheOrderOfThePayload) {
  (void)VeskCorvelPayloadUnpacker().unpack(messageOf(tree()));
  EXPECT_EQ(joined(),
            "payload 11; payload 12; headers inner; payload 21; payload 31; payload 32; headers -; "
            "context 3; request pr; status 1; status 2; status -; token ip; allocation pa; "
            "payload 1; ");
}

TEST_F(UnpackersTest, NothingIsCalledAfterARefusal) {
  const Data message = messageOf(tree());
  (void)VeskCorvelPayloadUnpacker().unpack(message);
  const std::vector<std::string> all = calls;
  for (std::size_t i = 0; i < all.size(); ++i) {
    calls.clear();
    refused = all[i];
    EXPECT_THROW((void)VeskCorvelPayloadUnpacker().unpack(message), Refusal);
    EXPECT_EQ(calls, std::vector<std::string>(all.begin(), all.begin() + static_cast<int>(i) + 1));
  }
}

TEST_F(UnpackersTest, ATunnelsHeadersComeFirstAndACommandIsOneCall) {
  VeskCommandWebTunnelResponseSchema tunnel;
  tunnel.command = 4;
  tunnel.httpHeaders = VeskCorvelProtocolHttpHeaders();
  (void)VeskCommandWebTunnelResponseUnpacker().unpack(messageOf(tunnel));
  VeskCommandResponseSchema response;
  response.command = 9;
  (void)VeskCommandResponseUnpacker().unpack(messageOf(response));
  EXPECT_EQ(joined(), "headers -; tunnel 4; response 9; ");
  refused = "headers -";
  EXPECT_THROW((void)VeskCommandWebTunnelResponseUnpacker().unpack(messageOf(tunnel)), Refusal);
  EXPECT_EQ(calls.back(), refused);
  refused = "response 9";
  EXPECT_THROW((void)VeskCommandResponseUnpacker().unpack(messageOf(response)), Refusal);
}

TEST_F(UnpackersTest, ADecodingErrorComesBeforeAnyCall) {
  const Data message(
      std::string_view("<plist><dict><key>c</key><integer>1</integer><key>h</key><dict/>"
                       "<key>mml</key><array><dict/></array></dict></plist>"));
  EXPECT_EQ(testing::refusalOf([&] { (void)VeskCorvelPayloadUnpacker().unpack(message); }),
            "keyNotFound mml[0].c: required key is missing");
  EXPECT_TRUE(calls.empty());
}

}  // namespace
}  // namespace ironmoat
