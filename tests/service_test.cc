// The service as a process, spoken to in bytes: what it answers to frames that are right, wrong,
// cut short or lies, and that it always ends in order.

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <thread>

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "frames/record_codec.h"
#include "ironmoat/command_response.h"
#include "ironmoat/limits.h"

namespace ironmoat {
namespace {

using frames::Reply;
using frames::Status;

struct Outcome {
  frames::Hello hello;
  std::multimap<std::uint64_t, Reply> replies;
  int status = -1;
};

/// Runs the service over two pipes, writes `input`, closes, and collects all that comes back.
Outcome converse(std::string_view input) {
  int toService[2];
  int fromService[2];
  EXPECT_EQ(pipe(toService), 0);
  EXPECT_EQ(pipe(fromService), 0);
  const pid_t child = fork();
  if (child == 0) {
    dup2(toService[0], 0);
    dup2(fromService[1], 1);
    for (const int descriptor : {toService[0], toService[1], fromService[0], fromService[1]}) {
      close(descriptor);
    }
    execl(IRONMOAT_SERVICE, IRONMOAT_SERVICE, nullptr);
    _exit(127);
  }
  close(toService[0]);
  close(fromService[1]);
  std::thread writer([&] {
    while (!input.empty()) {
      const ssize_t count = write(toService[1], input.data(), input.size());
      if (count <= 0) break;
      input.remove_prefix(static_cast<std::size_t>(count));
    }
    close(toService[1]);
  });
  Outcome outcome;
  frames::FrameAssembler assembler(frames::kMaxReplyBody, Sharing::anyThread);
  bool greeted = false;
  while (true) {
    const auto room = assembler.room();
    const ssize_t count = read(fromService[0], room.data(), room.size());
    if (count <= 0) break;
    assembler.commit(static_cast<std::size_t>(count));
    while (const auto body = assembler.next()) {
      if (!greeted) {
        outcome.hello = frames::parseHello(*body);
        greeted = true;
        continue;
      }
      Reply reply = frames::parseReply(*body);
      outcome.replies.emplace(reply.id, std::move(reply));
    }
  }
  EXPECT_TRUE(greeted);
  EXPECT_FALSE(assembler.midFrame());
  writer.join();
  close(fromService[0]);
  EXPECT_EQ(waitpid(child, &outcome.status, 0), child);
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

class ServiceTest : public ::testing::Test {
 protected:
  static void SetUpTestSuite() { std::signal(SIGPIPE, SIG_IGN); }
};

TEST_F(ServiceTest, GreetsAndEndsAtTheEndOfInput) {
  const Outcome outcome = converse("");
  frames::Hello expected = frames::Hello::ours();
  expected.confinement = outcome.hello.confinement;
  EXPECT_EQ(outcome.hello, expected);
  EXPECT_TRUE(outcome.replies.empty());
  EXPECT_EQ(outcome.status, 0);
}

TEST_F(ServiceTest, AnswersEachOfManyRequestsOnce) {
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

TEST_F(ServiceTest, BadRequestsGetAnErrorAndTheNextIsServed) {
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

TEST_F(ServiceTest, AnOverLongFrameEndsTheConnectionInOrder) {
  const std::string first = request(1, "VeskCommandResponse", response(1));
  const Outcome outcome =
      converse(first + std::string("\xFF\xFF\xFF\xFF", 4) + std::string(100000, 'x') + first);
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.replies.count(1), 1U);
  EXPECT_EQ(outcome.replies.count(0), 1U);
}

TEST_F(ServiceTest, AFrameCutShortIsAnEndOfInput) {
  const std::string whole = request(1, "VeskCommandResponse", response(1));
  for (const std::size_t length : {std::size_t{1}, std::size_t{4}, whole.size() - 1}) {
    const Outcome outcome = converse(whole + whole.substr(0, length));
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.replies.size(), 1U);
  }
}

TEST_F(ServiceTest, LargeMessagesUpToTheLimitAreServed) {
  const std::string padding(limits::messageBytes - response(1).size(), ' ');
  const Outcome outcome = converse(request(1, "VeskCommandResponse", response(1) + padding) +
                                   request(2, "VeskCommandResponse", response(2)));
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(commandOf(outcome.replies.find(1)->second), 1);
  EXPECT_EQ(commandOf(outcome.replies.find(2)->second), 2);
}

}  // namespace
}  // namespace ironmoat
