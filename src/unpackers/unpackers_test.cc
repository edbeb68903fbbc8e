// The three conversions, with stand-ins for the output records' initialisers that write down each
// call and refuse on demand.

#include <gtest/gtest.h>

#include <limits>
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
std::string show(Int value) { return std::to_string(value); }
std::string show(Int64 value) { return std::to_string(value); }
std::string show(const String& value) { return std::string(value.view()); }
std::string show(const Data& value) { return std::string(value.view()); }
template <class T>
std::string show(const Optional<T>& value) {
  return value ? show(*value) : "-";
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
  const DrelUserPayload output = VeskCorvelPayloadUnpacker().unpack(messageOf(tree()));
  EXPECT_EQ(joined(),
            "payload 11; payload 12; headers inner; payload 21; payload 31; payload 32; headers -; "
            "context 3; request pr; status 1; status 2; status -; token ip; allocation pa; "
            "payload 1; ");
  ASSERT_EQ(output.corvelMessageList.size(), 2U);
  EXPECT_EQ(output.corvelMessageList[0].dstIdTokenList[0].command, 21);
  EXPECT_EQ(output.dstIdTokenList[1].command, 12);
  EXPECT_EQ(output.allocationStatuses[1].participantId, Optional<Int64>(2));
  EXPECT_TRUE(output.httpHeaders.has_value());
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

TEST_F(UnpackersTest, OnlyACommandMakesOneCall) {
  const DrelUserPayload output = VeskCorvelPayloadUnpacker().unpack(messageOf(payload(INT64_MIN)));
  EXPECT_EQ(joined(), "payload -9223372036854775808; ");
  EXPECT_TRUE(output.dstIdTokenList.empty() && output.pluginRequests.empty());
  EXPECT_FALSE(output.httpHeaders || output.deliveryContext || output.KibbDownloadAuthList);

  VeskCorvelProtocolPayload empty = payload(1);
  empty.dstIdTokenList = List<VeskCorvelProtocolPayload>();
  empty.selfAllocTokenList = List<VeskHoplineSelfAllocToken>();
  empty.KibbDownloadAuthList = List<String>();
  empty.deliveryContext = VeskCorvelProtocolDeliveryContext();
  calls.clear();
  const DrelUserPayload same = VeskCorvelPayloadUnpacker().unpack(messageOf(empty));
  EXPECT_EQ(joined(), "context -; payload 1; ");
  EXPECT_TRUE(same.dstIdTokenList.empty() && same.selfAllocTokenList.empty());
  ASSERT_TRUE(same.KibbDownloadAuthList.has_value());
  EXPECT_TRUE(same.KibbDownloadAuthList->empty());
  ASSERT_TRUE(same.deliveryContext.has_value());
  EXPECT_FALSE(same.deliveryContext->count.has_value());
}

TEST_F(UnpackersTest, WebTunnelResponsesConvertTheirHeaderBlockFirst) {
  VeskCommandWebTunnelResponseSchema wire;
  wire.command = 4;
  wire.messageId = Int{-1};
  wire.epochTimeNanos = Int64{std::numeric_limits<Int64>::max()};
  const VeskCommandWebTunnelResponseUnpacker unpacker;
  EXPECT_FALSE(unpacker.unpack(messageOf(wire)).httpHeaders.has_value());
  EXPECT_EQ(joined(), "tunnel 4; ");
  calls.clear();
  wire.httpHeaders = with(&VeskCorvelProtocolHttpHeaders::asHttpHeader, String("as"));
  const VeskCommandWebTunnelResponse output = unpacker.unpack(messageOf(wire));
  EXPECT_EQ(joined(), "headers -; tunnel 4; ");
  EXPECT_EQ(output.httpHeaders->asHttpHeader, Optional<String>(String("as")));
  EXPECT_EQ(output.messageId, wire.messageId);
  EXPECT_EQ(output.epochTimeNanos, wire.epochTimeNanos);
  for (const char* call : {"headers -", "tunnel 4"}) {
    refused = call;
    EXPECT_THROW((void)unpacker.unpack(messageOf(wire)), Refusal);
    EXPECT_EQ(calls.back(), call);
  }
}

TEST_F(UnpackersTest, CommandResponsesPassThroughAndARefusalIsPassedOn) {
  VeskCommandResponseSchema wire;
  wire.command = 9;
  wire.messageId = Int64{1} << 40;
  wire.token = Data(std::string_view("\0\xFF", 2));
  wire.internalBuild = false;
  const VeskCommandResponse output = VeskCommandResponseUnpacker().unpack(messageOf(wire));
  EXPECT_EQ(output.messageId, wire.messageId);
  EXPECT_EQ(output.token, wire.token);
  EXPECT_EQ(output.internalBuild, Optional<Bool>(false));
  EXPECT_FALSE(output.loggingProfile.has_value());
  refused = "response 9";
  EXPECT_THROW((void)VeskCommandResponseUnpacker().unpack(messageOf(wire)), Refusal);
}

TEST_F(UnpackersTest, ADecodingErrorComesBeforeAnyCall) {
  const auto refusal = [](std::string_view xml) {
    const Data message{xml};
    return testing::refusalOf([&] { (void)VeskCorvelPayloadUnpacker().unpack(message); });
  };
  EXPECT_EQ(refusal("<plist><dict><key>c</key><integer>1</integer><key>mml</key><array><dict/>"
                    "</array><key>h</key><dict/></dict></plist>"),
            "keyNotFound mml[0].c: required key is missing");
  EXPECT_EQ(refusal("<plist><dict><key>Dc</key><dict><key>c</key><integer>1</integer></dict>"
                    "</dict></plist>"),
            "keyNotFound c: required key is missing");
  EXPECT_TRUE(refusal("").starts_with("malformed: "));
  for (const auto& unpack :
       {+[](const Data& message) { (void)VeskCommandResponseUnpacker().unpack(message); },
        +[](const Data& message) {
          (void)VeskCommandWebTunnelResponseUnpacker().unpack(message);
        }}) {
    const Data empty(std::string_view("<plist><dict/></plist>"));
    EXPECT_EQ(testing::refusalOf([&] { unpack(empty); }), "keyNotFound c: required key is missing");
  }
  EXPECT_TRUE(calls.empty());
}

}  // namespace
}  // namespace ironmoat
