// The three conversions, with initialisers of the output records that record each call and reject
// on demand.

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
#include "support/rejection.h"
#include "support/request_frame.h"
#include "support/written.h"
#include "support/xml_message.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"
#include "values/host_rejection.h"

namespace ironmoat {
namespace {

namespace xml = testing::xml;
using xml::entry;
using xml::list;
using xml::number;
using xml::text;

struct Rejection : std::runtime_error {
  using runtime_error::runtime_error;
};

std::vector<std::string> calls;
std::string rejected;          // the call that throws
std::function<void()> reject;  // throws

/// Records a call as "type argument", with the first argument.
void note(const std::string& type, const std::string& argument) {
  calls.push_back(type + " " + argument);
  if (calls.back() == rejected) reject();
}
template <class T>
std::string show(const T& value) {
  if constexpr (std::integral<T>) return std::to_string(value);
  if constexpr (requires { value.view(); }) return std::string(value.view());
  if constexpr (requires { value.has_value(); }) return value ? show(*value) : "-";
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

Data message(const std::string& entries) { return xml::message(xml::dictionary(entries)); }
std::string payload(int command, const std::string& entries = "") {
  return number("c", command) + entries;
}

/// Payload 1 with a record of every type nested in it, in the reverse order of conversion. Each
/// holds text, which leaks if a rejection leaves it behind.
Data tree() {
  const std::string inner = payload(21, entry("h", xml::dictionary(text("aS", "inner"))));
  return message(
      list("qpla", {text("qpln", "pa")}) + list("qsatv", {entry("qrip", "<data>aXA=</data>")}) +
      list("qal", {number("qri", 1), number("qri", 2), ""}) + list("qplr", {text("qpln", "pr")}) +
      entry("Dc", xml::dictionary(number("c", 3))) + entry("h", "<dict/>") +
      list("mml", {payload(31, text("ua", "a") + list("dtl", {inner})), payload(32)}) +
      list("dtl", {payload(11), payload(12, text("ua", "a"))}) + payload(1, text("ua", "a")));
}

class Unpackers : public ::testing::Test {
 protected:
  void SetUp() override {
    calls.clear();
    rejected.clear();
    reject = [] { throw Rejection(rejected); };
  }
};

using Calls = std::vector<std::string>;

TEST_F(Unpackers, InitialiseChildrenBeforeParentsUntilOneRejects) {
  const Data message = tree();
  (void)VeskCorvelPayloadUnpacker().unpack(message);
  const Calls all = calls;
  EXPECT_EQ(all, Calls({"payload 11", "payload 12", "headers inner", "payload 21", "payload 31",
                        "payload 32", "headers -", "context 3", "request pr", "status 1",
                        "status 2", "status -", "token ip", "allocation pa", "payload 1"}));
  for (std::size_t i = 0; i < all.size(); ++i) {
    calls.clear();
    rejected = all[i];
    EXPECT_THROW((void)VeskCorvelPayloadUnpacker().unpack(message), Rejection);
    EXPECT_EQ(calls, Calls(all.begin(), all.begin() + static_cast<int>(i) + 1));
  }
}

TEST_F(Unpackers, InitialiseTheHeadersOfAResponseFirst) {
  const Data tunnel = message(payload(4, entry("h", "<dict/>")));
  const Data response = message(payload(9));
  (void)VeskCommandWebTunnelResponseUnpacker().unpack(tunnel);
  (void)VeskCommandResponseUnpacker().unpack(response);
  EXPECT_EQ(calls, Calls({"headers -", "tunnel 4", "response 9"}));
  rejected = "headers -";
  EXPECT_THROW((void)VeskCommandWebTunnelResponseUnpacker().unpack(tunnel), Rejection);
  EXPECT_EQ(calls.back(), rejected);
  rejected = "response 9";
  EXPECT_THROW((void)VeskCommandResponseUnpacker().unpack(response), Rejection);
}

TEST_F(Unpackers, ReplyRejectedByHostWhateverTheInitialiserThrows) {
  IronmoatServer server(IronmoatServer::Sandboxed::no);
  server.registerUnpacker<VeskCommandResponse>(VeskCommandResponseUnpacker());
  const auto served = [&] {
    const Data bytes = message(payload(9));
    const std::string request = testing::written([&](BlockBuilder& out) {
      frames::appendRequest(out, 5, VeskCommandResponse::schemaName, bytes.view());
    });
    const std::string reply = testing::written(
        [&](BlockBuilder& out) { server.serve(Data(request.substr(frames::kLengthBytes)), out); });
    return frames::parseReply(Data(reply.substr(frames::kLengthBytes)));
  };
  const frames::Reply accepted = served();
  EXPECT_EQ(accepted.status, frames::Status::record);
  rejected = "response 9";
  const struct {
    std::function<void()> reject;
    std::string description;
  } rows[] = {
      {reject, rejected},
      {[] { throw std::bad_alloc(); }, std::bad_alloc().what()},
      {[] { throw DecodingError(DecodingError::Kind::malformed, "path", "not a record", 7); },
       "not a record"},
      {[] { throw frames::FrameError("not a frame"); }, "not a frame"},
      {[] { throw frames::RecordError("not a record"); }, "not a record"},
      {[] { throw 5; }, "the host rejected the record"},
  };
  for (const auto& row : rows) {
    reject = row.reject;
    const frames::Reply reply = served();
    EXPECT_EQ(reply.id, 5U);
    ASSERT_EQ(reply.status, frames::Status::rejected) << row.description;
    const DecodingError rejection = frames::parseRejection(reply.body);
    EXPECT_EQ(testing::inWords(rejection), "rejectedByHost: " + row.description);
    EXPECT_FALSE(rejection.offset().has_value());
  }
  // A client runs the initialisers a second time, on the record of the reply.
  const auto decode = [&] { (void)frames::decodeRecord<VeskCommandResponse>(accepted.body); };
  EXPECT_THROW(withHostRejections(decode), DecodingError);
  rejected.clear();
  const auto fail = [] { throw frames::RecordError("not of the host's"); };
  EXPECT_THROW(withHostRejections(fail), frames::RecordError);
}

TEST_F(Unpackers, CallNoInitialiserForAnInvalidMessage) {
  const Data wrong = message(payload(1, entry("h", "<dict/>") + list("mml", {""})));
  try {
    (void)VeskCorvelPayloadUnpacker().unpack(wrong);
    ADD_FAILURE() << "accepted";
  } catch (const DecodingError& rejection) {
    EXPECT_EQ(testing::inWords(rejection), "keyNotFound mml[0].c: missing required key");
  }
  EXPECT_TRUE(calls.empty());
}

}  // namespace
}  // namespace ironmoat
