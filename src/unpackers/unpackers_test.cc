// The three conversions, with initialisers of the output records that record each call and reject
// on demand.

#include <gtest/gtest.h>

#include <algorithm>
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

using Calls = std::vector<std::string>;
Calls calls;
std::string rejected;  // the call that throws
const std::function<void()> kThrow = [] { throw std::runtime_error(rejected); };
std::function<void()> reject = kThrow;

/// Records a call as "type argument", with the first argument.
template <class T>
void note(const std::string& type, const T& argument) {
  std::string& call = calls.emplace_back(type + " ");
  if constexpr (std::integral<T>) {
    call += std::to_string(argument);
  } else if (argument) {
    if constexpr (requires { argument->view(); }) call += argument->view();
    if constexpr (requires { std::to_string(*argument); }) call += std::to_string(*argument);
  }
  if (call == rejected) reject();
}

}  // namespace

void admit(const VeskCommandResponseArguments& a) { note("response", a.command); }
void admit(const VeskCommandWebTunnelResponseArguments& a) { note("tunnel", a.command); }
void admit(const DrelUserPayloadHttpHeadersArguments& a) {
  note("headers", a.adhocServiceOverride);
}
void admit(const DrelUserPayloadDeliveryContextArguments& a) { note("context", a.count); }
void admit(const DrelHoplinePluginRequestArguments& a) { note("request", a.pluginName); }
void admit(const DrelHoplineAllocationStatusArguments& a) { note("status", a.participantId); }
void admit(const DrelHoplineSelfAllocTokenArguments& a) { note("token", a.relayIp); }
void admit(const DrelHoplinePluginAllocationArguments& a) { note("allocation", a.pluginName); }
void admit(const DrelUserPayloadArguments& a) { note("payload", a.command); }

namespace {

Data message(const std::string& entries) { return xml::message(xml::dictionary(entries)); }
std::string payload(int command, const std::string& entries = "") {
  return number("c", command) + entries;
}

/// The calls for a message, until each of them in turn rejects.
template <class Unpacker>
void expectCalls(const std::string& entries, const Calls& expected) {
  for (const std::string& last : expected) {
    calls.clear();
    rejected = last;
    EXPECT_THROW((void)Unpacker().unpack(message(entries)), std::runtime_error);
    const auto end = std::find(expected.begin(), expected.end(), last) + 1;
    EXPECT_EQ(calls, Calls(expected.begin(), end));
  }
  calls.clear();
  rejected.clear();
  (void)Unpacker().unpack(message(entries));
  EXPECT_EQ(calls, expected);
}

TEST(Unpackers, InitialiseChildrenBeforeParentsUntilOneRejects) {
  const std::string inner = payload(21, entry("h", xml::dictionary(text("aS", "inner"))));
  // Of each type, in the reverse order of conversion. Each holds text, which leaks if a rejection
  // leaves it behind.
  expectCalls<VeskCorvelPayloadUnpacker>(
      list("qpla", {text("qpln", "pa")}) + list("qsatv", {entry("qrip", "<data>aXA=</data>")}) +
          list("qal", {number("qri", 1), number("qri", 2), ""}) +
          list("qplr", {text("qpln", "pr")}) + entry("Dc", xml::dictionary(number("c", 3))) +
          entry("h", "<dict/>") +
          list("mml", {payload(31, text("ua", "a") + list("dtl", {inner})), payload(32)}) +
          list("dtl", {payload(11), payload(12, text("ua", "a"))}) + payload(1, text("ua", "a")),
      {"payload 11", "payload 12", "headers inner", "payload 21", "payload 31", "payload 32",
       "headers ", "context 3", "request pr", "status 1", "status 2", "status ", "token ip",
       "allocation pa", "payload 1"});
  expectCalls<VeskCommandWebTunnelResponseUnpacker>(payload(4, entry("h", "<dict/>")),
                                                    {"headers ", "tunnel 4"});
  expectCalls<VeskCommandResponseUnpacker>(payload(9), {"response 9"});
  calls.clear();
  const Data wrong = message(payload(1, entry("h", "<dict/>") + list("mml", {""})));
  EXPECT_THROW((void)VeskCorvelPayloadUnpacker().unpack(wrong), DecodingError);
  EXPECT_TRUE(calls.empty());
}

TEST(Unpackers, ReplyRejectedByHostWhateverTheInitialiserThrows) {
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
  const std::pair<std::function<void()>, std::string> rows[] = {
      {kThrow, rejected},
      {[] { throw std::bad_alloc(); }, std::bad_alloc().what()},
      {[] { throw DecodingError(DecodingError::Kind::malformed, "path", "of mine", 7); },
       "of mine"},
      {[] { throw frames::FrameError("not a frame"); }, "not a frame"},
      {[] { throw frames::RecordError("not a record"); }, "not a record"},
      {[] { throw 5; }, "the host rejected the record"},
  };
  for (const auto& row : rows) {
    reject = row.first;
    const frames::Reply reply = served();
    EXPECT_EQ(reply.id, 5U);
    ASSERT_EQ(reply.status, frames::Status::rejected) << row.second;
    const DecodingError rejection = frames::parseRejection(reply.body);
    EXPECT_EQ(testing::inWords(rejection), "rejectedByHost: " + row.second);
    EXPECT_FALSE(rejection.offset().has_value());
  }
  // A client runs the initialisers a second time, on the record of the reply.
  const auto decode = [&] { (void)frames::decodeRecord<VeskCommandResponse>(accepted.body); };
  EXPECT_THROW(withHostRejections(decode), DecodingError);
  rejected.clear();
  const auto fail = [] { throw frames::RecordError("not of the host's"); };
  EXPECT_THROW(withHostRejections(fail), frames::RecordError);
}

}  // namespace
}  // namespace ironmoat
