// The service as a process, spoken to in bytes: what it answers to frames that are right, wrong,
// cut short or lies, and that it always ends in order. (S1)

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <thread>

#include "frames/record_codec.h"
#include "ironmoat/limits.h"
#include "support/spoken_to.h"

namespace ironmoat {
namespace {

using frames::Reply;
using frames::Status;

struct Outcome {
  frames::Hello hello;
  std::multimap<std::uint64_t, Reply> replies;
  int status = -1;
};

/// Starts the service, writes `input`, closes, and collects all that comes back.
Outcome converse(std::string_view input) {
  testing::SpokenTo service([] { execl(IRONMOAT_SERVICE, IRONMOAT_SERVICE, nullptr); });
  std::thread writer([&] {
    service.send(input);
    service.endInput();
  });
  Outcome outcome;
  const auto hello = service.receive();
  EXPECT_TRUE(hello);
  if (hello) outcome.hello = frames::parseHello(*hello);
  while (const auto body = service.receive()) {
    Reply reply = frames::parseReply(*body);
    outcome.replies.emplace(reply.id, std::move(reply));
  }
  EXPECT_FALSE(service.midFrame());
  writer.join();
  outcome.status = service.end();
  return outcome;
}

std::string request(std::uint64_t id, std::string_view outputType, std::string_view message) {
  BlockBuilder out;
  frames::appendRequest(out, id, outputType, message);
  const BlockRef block = out.finish();
  return {block->bytes(), block->size()};
}

std::string response(int command) {
  return "<plist version=\"1.0\"><dict><key>c</key><integer>" + std::to_string(command) +
         "</integer></dict></plist>";
}

Int commandOf(const Reply& reply) {
  return frames::decodeRecord<VeskCommandResponse>(reply.body).command;
}

TEST(ServiceTest, GreetsAndEndsAtTheEndOfInput) {
  const Outcome outcome = converse("");
  frames::Hello expected = frames::Hello::ours();
  expected.confinement = outcome.hello.confinement;
  EXPECT_EQ(outcome.hello, expected);
  EXPECT_TRUE(outcome.replies.empty());
  EXPECT_EQ(outcome.status, 0);
}

TEST(ServiceTest, AnswersEachOfManyRequestsOnce) {
  std::string input;
  constexpr int kRequests = 2000;
  for (int i = 0; i < kRequests; ++i) {
    input += request(static_cast<std::uint64_t>(i), "VeskCommandResponse",
                     i % 3 == 0 ? "junk" : response(i));
  }
  const Outcome outcome = converse(input);
  EXPECT_EQ(outcome.status, 0);
  ASSERT_EQ(outcome.replies.size(), static_cast<std::size_t>(kRequests));
  for (int i = 0; i < kRequests; ++i) {
    const auto found = outcome.replies.find(static_cast<std::uint64_t>(i));
    ASSERT_NE(found, outcome.replies.end());
    if (i % 3 == 0) {
      ASSERT_EQ(found->second.status, Status::refused);
      EXPECT_EQ(frames::parseRefusal(found->second.body).kind(), DecodingError::Kind::malformed);
    } else {
      ASSERT_EQ(found->second.status, Status::record);
      EXPECT_EQ(commandOf(found->second), i);
    }
  }
}

TEST(ServiceTest, BadRequestsGetAnErrorAndTheNextIsServed) {
  const std::string shortBody = request(7, "VeskCommandResponse", "");
  std::string lyingName = request(8, "VeskCommandResponse", "");
  lyingName[12] = '\xFF';                      // the name claims to be longer than the frame
  std::string tiny("\x03\x00\x00\x00xyz", 7);  // too short for an id
  const Outcome outcome = converse(request(5, "NoSuchType", "x") + shortBody + lyingName + tiny +
                                   request(9, "VeskCommandResponse", response(9)));
  EXPECT_EQ(outcome.status, 0);
  ASSERT_EQ(outcome.replies.size(), 5U);
  const auto reply = [&](std::uint64_t id) { return outcome.replies.find(id)->second; };
  EXPECT_EQ(reply(5).status, Status::notServed);
  EXPECT_EQ(frames::parseSentence(reply(5).body), "no unpacker for this type");
  EXPECT_EQ(reply(7).status, Status::refused);
  EXPECT_EQ(reply(8).status, Status::notServed);
  EXPECT_EQ(reply(0).status, Status::notServed);
  EXPECT_EQ(commandOf(reply(9)), 9);
}

TEST(ServiceTest, AnOverLongFrameEndsTheConnectionInOrder) {
  const std::string first = request(1, "VeskCommandResponse", response(1));
  const Outcome outcome =
      converse(first + std::string("\xFF\xFF\xFF\xFF", 4) + std::string(100000, 'x') + first);
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.replies.count(1), 1U);
  EXPECT_EQ(outcome.replies.count(0), 1U);
}

TEST(ServiceTest, AFrameCutShortIsAnEndOfInput) {
  const std::string whole = request(1, "VeskCommandResponse", response(1));
  for (const std::size_t length : {std::size_t{1}, std::size_t{4}, whole.size() - 1}) {
    const Outcome outcome = converse(whole + whole.substr(0, length));
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.replies.size(), 1U);
  }
}

TEST(ServiceTest, LargeMessagesUpToTheLimitAreServed) {
  const std::string padding(limits::messageBytes - response(1).size(), ' ');
  const Outcome outcome = converse(request(1, "VeskCommandResponse", response(1) + padding) +
                                   request(2, "VeskCommandResponse", response(2)));
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(commandOf(outcome.replies.find(1)->second), 1);
  EXPECT_EQ(commandOf(outcome.replies.find(2)->second), 2);
}

}  // namespace
}  // namespace ironmoat
