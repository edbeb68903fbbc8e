// The three conversions, with stand-ins for the output records' initialisers that write down each
// call and refuse on demand.

#include <gtest/gtest.h>

#include <concepts>
#include <functional>
#include <new>
#include <stdexcept>
#include <string>
#include <vector>

#include "frames/frame.h"
#include "frames/record_codec.h"
#include "host/server.h"
#include "support/refusal.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"
#include "values/host_rejection.h"

namespace ironmoat {
namespace {

struct Refusal : std::runtime_error {
  using runtime_error::runtime_error;
};

std::vector<std::string> calls;
std::string refused;           // the call that the host refuses
std::function<void()> refuse;  // how

/// A call as "type argument", where the argument is the first one.
void note(const std::string& type, const std::string& argument) {
  calls.push_back(type + " " + argument);
  if (calls.back() == refused) refuse();
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

Data message(const std::string& entries) {
  return Data(std::string_view("<plist><dict>" + entries + "</dict></plist>"));
}
std::string list(const std::string& key, const std::vector<std::string>& elements) {
  std::string all = "<key>" + key + "</key><array>";
  for (const std::string& entries : elements) all.append("<dict>" + entries + "</dict>");
  return all + "</array>";
}
std::string text(const std::string& key, const std::string& value) {
  return "<key>" + key + "</key><string>" + value + "</string>";
}
std::string number(const std::string& key, int value) {
  return "<key>" + key + "</key><integer>" + std::to_string(value) + "</integer>";
}
std::string payload(int command, const std::string& entries = "") {
  return number("c", command) + entries;
}

/// Payload 1 with everything nested in it, down to payloads in payloads, last things first.
/// Wherever the host refuses, what is left unconverted holds text, and would leak if it were
/// forgotten.
Data tree() {
  const std::string inner = payload(21, "<key>h</key><dict>" + text("aS", "inner") + "</dict>");
  return message(
      list("qpla", {text("qpln", "pa")}) + list("qsatv", {"<key>qrip</key><data>aXA=</data>"}) +
      list("qal", {number("qri", 1), number("qri", 2), ""}) + list("qplr", {text("qpln", "pr")}) +
      "<key>Dc</key><dict>" + number("c", 3) + "</dict><key>h</key><dict/>" +
      list("mml", {payload(31, text("ua", "a") + list("dtl", {inner})), payload(32)}) +
      list("dtl", {payload(11), payload(12, text("ua", "a"))}) + payload(1, text("ua", "a")));
}

class UnpackersTest : public ::testing::Test {
 protected:
  void SetUp() override {
    calls.clear();
    refused.clear();
    refuse = [] { throw Refusal(refused); };
  }
};

TEST_F(UnpackersTest, ChildrenComeBeforeParentsInTheOrderOfThePayload) {
  (void)VeskCorvelPayloadUnpacker().unpack(tree());
  EXPECT_EQ(joined(),
            "payload 11; payload 12; headers inner; payload 21; payload 31; payload 32; headers -; "
            "context 3; request pr; status 1; status 2; status -; token ip; allocation pa; "
            "payload 1; ");
}

TEST_F(UnpackersTest, NothingIsCalledAfterARefusal) {
  const Data message = tree();
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
  const Data tunnel = message(payload(4, "<key>h</key><dict/>"));
  const Data response = message(payload(9));
  (void)VeskCommandWebTunnelResponseUnpacker().unpack(tunnel);
  (void)VeskCommandResponseUnpacker().unpack(response);
  EXPECT_EQ(joined(), "headers -; tunnel 4; response 9; ");
  refused = "headers -";
  EXPECT_THROW((void)VeskCommandWebTunnelResponseUnpacker().unpack(tunnel), Refusal);
  EXPECT_EQ(calls.back(), refused);
  refused = "response 9";
  EXPECT_THROW((void)VeskCommandResponseUnpacker().unpack(response), Refusal);
}

/// A client runs the initialisers a second time, on the record that comes back.
TEST_F(UnpackersTest, ServeRepliesRejectedByHostWhateverTheInitialiserThrows) {
  IronmoatServer server(IronmoatServer::Confine::no);
  server.registerUnpacker<VeskCommandResponse>(VeskCommandResponseUnpacker());
  const auto served = [&] {
    BlockBuilder request;
    const Data bytes = message(payload(9));
    frames::appendRequest(request, 5, VeskCommandResponse::schemaName, bytes.view());
    BlockBuilder reply;
    server.serve(Data(std::string_view(request.bytes(), request.size()).substr(4)), reply);
    return frames::parseReply(Data(std::string_view(reply.bytes(), reply.size()).substr(4)));
  };
  const frames::Reply accepted = served();
  EXPECT_EQ(accepted.status, frames::Status::record);
  refused = "response 9";
  const struct {
    std::function<void()> refuse;
    std::string description;
  } rows[] = {
      {refuse, refused},
      {[] { throw std::bad_alloc(); }, std::bad_alloc().what()},
      {[] { throw DecodingError(DecodingError::Kind::malformed, "path", "not a record", 7); },
       "not a record"},
      {[] { throw frames::FrameError("not a frame"); }, "not a frame"},
      {[] { throw frames::RecordError("not a record"); }, "not a record"},
      {[] { throw 5; }, "the host rejected the record"},
  };
  for (const auto& row : rows) {
    refuse = row.refuse;
    const frames::Reply reply = served();
    EXPECT_EQ(reply.id, 5U);
    ASSERT_EQ(reply.status, frames::Status::refused) << row.description;
    const DecodingError rejection = frames::parseRefusal(reply.body);
    EXPECT_EQ(testing::inWords(rejection), "rejectedByHost: " + row.description);
    EXPECT_FALSE(rejection.offset().has_value());
  }
  const auto decode = [&] { (void)frames::decodeRecord<VeskCommandResponse>(accepted.body); };
  EXPECT_THROW(withHostRejections(decode), DecodingError);
  refused.clear();
  const auto fail = [] { throw frames::RecordError("not of the host's"); };
  EXPECT_THROW(withHostRejections(fail), frames::RecordError);
}

TEST_F(UnpackersTest, ADecodingErrorComesBeforeAnyCall) {
  const Data wrong = message(payload(1, "<key>h</key><dict/>" + list("mml", {""})));
  try {
    (void)VeskCorvelPayloadUnpacker().unpack(wrong);
    ADD_FAILURE() << "accepted";
  } catch (const DecodingError& rejection) {
    EXPECT_EQ(testing::inWords(rejection), "keyNotFound mml[0].c: required key is missing");
  }
  EXPECT_TRUE(calls.empty());
}

}  // namespace
}  // namespace ironmoat
