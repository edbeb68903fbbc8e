#include "frames/record_codec.h"

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <utility>

#include "ironmoat/command_response.h"
#include "ironmoat/limits.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "support/tight_message.h"
#include "support/written.h"

namespace ironmoat {

namespace frames {
namespace {

using namespace std::string_literals;
using testing::tightMessage;
using Response = VeskCommandResponse;
using Tunnel = VeskCommandWebTunnelResponse;
using Payload = DrelUserPayload;

std::string encoded(const auto& record) {
  return testing::written([&](BlockBuilder& out) { encodeRecord(record, out); });
}

/// The description of the error that rejects `body`; empty if it is encoded as it was.
template <class R>
std::string rejection(const std::string& body) {
  try {
    EXPECT_EQ(encoded(decodeRecord<R>(tightMessage(body))), body);
    return "";
  } catch (const RecordError& error) {
    return error.what();
  }
}

TEST(RecordCodec, EncodesAsSpecified) {
  VeskCommandWebTunnelResponseArguments arguments;
  arguments.command = INT64_MIN + 42;
  arguments.contentType = String("a\xC3\xA9");
  DrelUserPayloadHttpHeadersArguments headers;
  headers.adhocServiceOverride = String("h");
  headers.strictTransportSecurity = String();
  arguments.httpHeaders = DrelUserPayloadHttpHeaders::with(std::move(headers));
  const std::string laidOut =
      "\x91\0\x2A\0\0\0\0\0\0\x80\3\0\0\0a\xC3\xA9"  // fields 0, 4 and 7 of 13
      "\x05\1\0\0\0h\0\0\0\0"s;                      // fields 0 and 2 of 6
  EXPECT_EQ(encoded(Tunnel::with(std::move(arguments))), laidOut);
  const Data body = tightMessage(laidOut);
  const Tunnel back = decodeRecord<Tunnel>(body);
  EXPECT_EQ(back.contentType->view().data(), body.view().data() + 14);  // not a copy
}

TEST(RecordCodec, RejectsInvalidBytes) {
  const std::string command = "\x2A\0\0\0\0\0\0\x80"s;
  const struct {
    std::string body;
    std::string_view description;
  } rows[] = {
      {"", "unexpected end of record"},
      {"\0\0"s + command, "missing required field"},
      {"\x01\x80"s + command, "unexpected presence bit"},
      {"\x01\0"s + command + "x", "unexpected bytes after the record"},
      {"\x01\0"s + command.substr(1), "unexpected end of record"},
      {"\x41\0"s + command + "\2"s, "not a valid Bool"},
      {"\x01\1"s + command + "\2\0\0\0\xC3("s, "not a valid UTF-8 text"},
      {"\x01\1"s + command + "\xFF\xFF\xFF\xFFxyz"s, "unexpected end of record"},
      {"\x05\0"s + command + "\4\0\0\0xyz"s, "unexpected end of record"},
      {"\x05\0"s + command + "\3\0\0"s, "unexpected end of record"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(rejection<Response>(row.body), row.description) << ::testing::PrintToString(row.body);
  }
}

TEST(RecordCodec, LimitsNestingAndElements) {
  const auto nested = [](std::uint32_t levels) {
    Payload record = Payload::with({});
    while (--levels > 0) {
      DrelUserPayloadArguments outer;
      outer.corvelMessageList.push_back(std::move(record));
      record = Payload::with(std::move(outer));
    }
    return encoded(record);
  };
  const std::string deepest = nested(limits::nestedContainers);
  EXPECT_EQ(rejection<Payload>(deepest), "");
  EXPECT_THROW(static_cast<void>(nested(limits::nestedContainers + 1)), RecordError);
  std::string two = nested(2);
  const std::string opening = two.substr(0, two.find(nested(1), 1));
  EXPECT_EQ(rejection<Payload>(opening + deepest), "nesting exceeds the limit of 512 records");
  two.replace(opening.size() - 4, 4, "\2\0\0\0"s);  // elements, of which it has one
  EXPECT_EQ(rejection<Payload>(two), "list exceeds the rest of the record");
}

TEST(RecordCodec, LimitsMemoryOfAllLists) {
  DrelUserPayloadArguments arguments;
  arguments.dstIdTokenList.push_back(Payload::with({}));  // counts with the other list
  const std::size_t max = limits::recordBytes / sizeof(Payload);
  arguments.corvelMessageList.assign(max - 1, Payload::with({}));
  EXPECT_EQ(rejection<Payload>(encoded(Payload::with(arguments))), "");
  arguments.corvelMessageList.push_back(Payload::with({}));
  EXPECT_EQ(rejection<Payload>(encoded(Payload::with(std::move(arguments)))),
            "memory of lists exceeds the limit of 67108864 bytes");
}

TEST(RecordCodec, LimitsTextDataAndBytesOfReply) {
  VeskCommandResponseArguments arguments;
  arguments.token = Data(std::string(limits::deliveredBytes - 1, 'x'));
  arguments.applicationId = String("y");
  EXPECT_EQ(rejection<Response>(encoded(Response::with(arguments))), "");
  arguments.applicationId = String("yz");
  EXPECT_NE(rejection<Response>(encoded(Response::with(arguments))), "");

  constexpr std::size_t kRest = 2 + 8 + 3 * 4;  // presence, command, lengths
  arguments.applicationId.reset();
  arguments.token = arguments.messageUUID = Data(std::string(limits::deliveredBytes, 'x'));
  const std::string last(limits::replyBytes - kRest - 2 * limits::deliveredBytes, 'x');
  arguments.veskSessionId = Data(last);
  EXPECT_EQ(encoded(Response::with(arguments)).size(), limits::replyBytes);
  arguments.veskSessionId = Data(last + 'x');
  EXPECT_THROW(encoded(Response::with(arguments)), RecordError);
}

}  // namespace
}  // namespace frames
}  // namespace ironmoat
