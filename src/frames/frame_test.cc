#include "frames/frame.h"

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

#include "frames/frame_assembler.h"
#include "ironmoat/limits.h"
#include "support/tight_message.h"

namespace ironmoat::frames {
namespace {

using namespace std::string_literals;
using Kind = DecodingError::Kind;

std::string number(std::uint64_t value, std::size_t bytes) {
  std::string text;
  for (std::size_t i = 0; i < bytes; ++i) text.push_back(static_cast<char>(value >> (8 * i)));
  return text;
}

std::string frame(const std::string& body) { return number(body.size(), 4) + body; }

/// The bytes that `append` appends.
template <class Append>
std::string written(Append append) {
  BlockBuilder out;
  append(out);
  return std::string(out.bytes(), out.size());
}

std::string bodyOf(const std::string& frame) { return frame.substr(kLengthBytes); }

const Hello kHello{1, 5, 0x0102030405060708, 2, 3, 4, 512};
const std::string kHelloFrame = frame("IRONMOAT\x01\0\x05\0\0\0\x08\x07\x06\x05\x04\x03\x02\x01"s +
                                      number(2, 8) + number(3, 8) + number(4, 8) + number(512, 4));
const std::string kRequestFrame = frame("\x2A\0\0\0\0\0\0\x80\x05Type1<msg>"s);
const DecodingError kError(Kind::typeMismatch, "mml[1].U", "expected data", 0x1234);
const std::string kRefusalFrame =
    frame("\x07\0\0\0\0\0\0\0\x01\x02\x34\x12\0\0\0\0\0\0\x08\0mml[1].Uexpected data"s);

TEST(FrameTest, FramesAreLaidOutAsDescribed) {
  EXPECT_EQ(written([](auto& out) { appendHello(out, kHello); }), kHelloFrame);
  EXPECT_EQ(parseHello(Data(bodyOf(kHelloFrame))), kHello);

  const std::uint64_t id = 0x800000000000002A;
  EXPECT_EQ(written([&](auto& out) { appendRequest(out, id, "Type1", "<msg>"); }), kRequestFrame);
  const Data requestBody(bodyOf(kRequestFrame));
  const Request request = parseRequest(requestBody);
  EXPECT_EQ(request.id, id);
  EXPECT_EQ(request.outputType, "Type1");
  EXPECT_EQ(request.message.view(), "<msg>");
  EXPECT_EQ(request.message.slice().block(), requestBody.slice().block());

  EXPECT_EQ(written([](auto& out) { appendRefusal(out, 7, kError); }), kRefusalFrame);
  const Reply reply = parseReply(Data(bodyOf(kRefusalFrame)));
  EXPECT_EQ(reply.id, 7U);
  EXPECT_EQ(reply.status, Status::refused);
  const DecodingError error = parseRefusal(reply.body);
  EXPECT_EQ(error.kind(), kError.kind());
  EXPECT_EQ(error.path(), kError.path());
  EXPECT_EQ(error.offset(), kError.offset());
  EXPECT_STREQ(error.what(), kError.what());

  EXPECT_EQ(written([](auto& out) { appendSentence(out, 1, Status::failed, "why"); }),
            frame(number(1, 8) + "\3why"));
  EXPECT_EQ(written([](auto& out) {
              out.append("before");
              const std::size_t start = beginReply(out, 2, Status::record);
              out.append("fields");
              endReply(out, start);
            }),
            "before" + frame(number(2, 8) + "\0fields"s));
}

TEST(FrameTest, ARefusalWithoutOffsetHasNone) {
  BlockBuilder out;
  appendRefusal(out, 1, DecodingError(Kind::keyNotFound, "", ""));
  const std::string body(out.bytes() + kLengthBytes, out.size() - kLengthBytes);
  const DecodingError error = parseRefusal(parseReply(Data(body)).body);
  EXPECT_FALSE(error.offset().has_value());
  EXPECT_EQ(error.kind(), Kind::keyNotFound);
}

TEST(FrameTest, BrokenBodiesAreRefused) {
  const auto hello = [](const std::string& body) { (void)parseHello(testing::tightMessage(body)); };
  const auto request = [](const std::string& body) {
    (void)parseRequest(testing::tightMessage(body));
  };
  const auto reply = [](const std::string& body) { (void)parseReply(testing::tightMessage(body)); };
  const auto refusal = [](const std::string& body) {
    (void)parseRefusal(testing::tightMessage(body));
  };
  const auto sentence = [](const std::string& body) {
    (void)parseSentence(testing::tightMessage(body));
  };

  // Every byte up to here has to be there; what follows may have any length.
  const std::string goodHello = bodyOf(kHelloFrame);
  const std::string goodRequest = bodyOf(kRequestFrame);
  const std::string goodRefusal = bodyOf(kRefusalFrame).substr(9);
  for (std::size_t i = 0; i < goodHello.size(); ++i) {
    EXPECT_THROW(hello(goodHello.substr(0, i)), FrameError) << i;
  }
  for (std::size_t i = 0; i < 8 + 1 + 5; ++i) {
    EXPECT_THROW(request(goodRequest.substr(0, i)), FrameError) << i;
    EXPECT_EQ(requestId(testing::tightMessage(goodRequest.substr(0, i))).has_value(), i >= 8) << i;
  }
  for (std::size_t i = 0; i < 9; ++i) {
    EXPECT_THROW(reply(bodyOf(kRefusalFrame).substr(0, i)), FrameError) << i;
  }
  for (std::size_t i = 0; i < 1 + 8 + 2 + 8; ++i) {
    EXPECT_THROW(refusal(goodRefusal.substr(0, i)), FrameError) << i;
  }

  EXPECT_THROW(hello(goodHello + "x"), FrameError);
  EXPECT_THROW(hello("IRONMOAX" + goodHello.substr(8)), FrameError);
  EXPECT_THROW(hello("IRONMOAT\2\0"s + goodHello.substr(10)), FrameError);
  EXPECT_THROW(request(number(1, 8) + "\0rest"s), FrameError);
  EXPECT_THROW(request(number(1, 8) + "\xFFshort"), FrameError);
  EXPECT_THROW(reply(number(1, 8) + "\4"), FrameError);
  EXPECT_THROW(refusal("\5" + goodRefusal.substr(1)), FrameError);
  EXPECT_THROW(refusal("\0"s + number(0, 8) + "\xFF\xFFpath"), FrameError);
  EXPECT_THROW(refusal("\0"s + number(0, 8) + "\1\0\xC3\xA9"s), FrameError);
  EXPECT_THROW(refusal("\0"s + number(0, 8) + "\0\0\xC3"s), FrameError);
  EXPECT_THROW(sentence("\xED\xA0\x80"), FrameError);
  EXPECT_THROW(sentence("zero\0byte"s), FrameError);
  EXPECT_NO_THROW(sentence(std::string(65535, 'x')));
  EXPECT_THROW(sentence(std::string(65536, 'x')), FrameError);
}

TEST(FrameTest, WritersOnlyWriteWhatCanBeRead) {
  const std::string path(65534, 'p');
  BlockBuilder out;
  appendRefusal(out, 1, DecodingError(Kind::malformed, path + "\xC3\xA9", "a\xFF z"));
  const std::string body(out.bytes() + kLengthBytes, out.size() - kLengthBytes);
  const DecodingError error = parseRefusal(parseReply(Data(body)).body);
  EXPECT_EQ(error.path(), path);
  EXPECT_STREQ(error.what(), "a");

  const std::size_t size = out.size();
  EXPECT_THROW(appendRequestHead(out, 1, "", 0), FrameError);
  EXPECT_THROW(appendRequestHead(out, 1, std::string(256, 'n'), 0), FrameError);
  EXPECT_THROW(appendRequestHead(out, 1, "n", kMaxRequestBody), FrameError);
  EXPECT_NO_THROW(appendRequestHead(out, 1, std::string(255, 'n'), limits::messageBytes));
  out.truncate(size);
  const std::size_t start = beginReply(out, 1, Status::record);
  out.extend(limits::replyBytes);
  EXPECT_NO_THROW(endReply(out, start));
  out.push('x');
  EXPECT_THROW(endReply(out, start), FrameError);
  EXPECT_EQ(out.size(), size);
}

/// Feeds `stream` in pieces of at most `piece` bytes and takes out every body as soon as it can be.
std::vector<std::string> assembled(FrameAssembler& assembler, std::string_view stream,
                                   std::size_t piece) {
  std::vector<std::string> bodies;
  while (!stream.empty()) {
    const std::span<char> room = assembler.room();
    const std::size_t count = std::min({piece, room.size(), stream.size()});
    EXPECT_GT(count, 0U);
    stream.copy(room.data(), count);
    stream.remove_prefix(count);
    assembler.commit(count);
    while (const auto body = assembler.next()) bodies.emplace_back(body->view());
  }
  return bodies;
}

TEST(FrameAssemblerTest, BodiesDoNotDependOnHowTheyArrive) {
  std::vector<std::string> bodies;
  std::string stream;
  // Around the buffer's size, and runs of small frames before and behind large ones.
  for (const std::size_t size :
       {0, 1, 5, 65531, 65532, 65533, 3, 65536, 200000, 0, 0, 7, 40000, 40000, 100, 1000000, 1}) {
    bodies.emplace_back(size, static_cast<char>('a' + bodies.size()));
    stream += frame(bodies.back());
  }
  for (const std::size_t piece : {1, 2, 3, 7, 1000, 65535, 65536, 4000000}) {
    FrameAssembler assembler(1000000, Sharing::oneThread);
    EXPECT_EQ(assembled(assembler, stream, piece), bodies) << piece;
    EXPECT_FALSE(assembler.midFrame());
  }
}

TEST(FrameAssemblerTest, BodiesOutliveTheAssembler) {
  std::vector<Data> bodies;
  {
    FrameAssembler assembler(100, Sharing::anyThread);
    const std::string stream = frame("one") + frame("two") + "\3"s;
    stream.copy(assembler.room().data(), stream.size());
    assembler.commit(stream.size());
    while (const auto body = assembler.next()) bodies.push_back(*body);
    EXPECT_TRUE(assembler.midFrame());
  }
  ASSERT_EQ(bodies.size(), 2U);
  EXPECT_EQ(bodies[0].view(), "one");
  EXPECT_EQ(bodies[1].view(), "two");
  EXPECT_NE(bodies[0].slice().block(), bodies[1].slice().block());
}

TEST(FrameAssemblerTest, MemoryFollowsWhatCameNotWhatWasAnnounced) {
  FrameAssembler assembler(UINT32_MAX, Sharing::anyThread);
  EXPECT_TRUE(assembled(assembler, "\xFF\xFF\xFF\xFF+++"s, 7).empty());
  EXPECT_TRUE(assembler.midFrame());
  std::size_t came = 3;
  for (int i = 0; i < 8; ++i) {
    const std::size_t room = assembler.room().size();
    EXPECT_LE(room, std::max<std::size_t>(65536, came));
    assembler.commit(room);
    came += room;
    EXPECT_FALSE(assembler.next().has_value());
  }
}

TEST(FrameAssemblerTest, AnnouncingTooMuchEndsTheConnection) {
  FrameAssembler assembler(10, Sharing::anyThread);
  EXPECT_EQ(assembled(assembler, frame("0123456789"), 100).size(), 1U);
  EXPECT_TRUE(assembled(assembler, "\x0B\0\0"s, 100).empty());
  EXPECT_THROW(assembled(assembler, "\0"s, 100), FrameError);
  EXPECT_THROW((void)assembler.next(), FrameError);
}

}  // namespace
}  // namespace ironmoat::frames
