#include "frames/frame.h"

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

#include "frames/frame_assembler.h"
#include "ironmoat/limits.h"
#include "support/tight_message.h"
#include "support/written.h"

namespace ironmoat::frames {
namespace {

using namespace std::string_literals;
using testing::tightMessage;
using testing::written;
using Kind = DecodingError::Kind;

std::string number(std::uint64_t value, std::size_t bytes) {
  std::string text;
  for (std::size_t i = 0; i < bytes; ++i) text.push_back(static_cast<char>(value >> (8 * i)));
  return text;
}
std::string frame(const std::string& body) { return number(body.size(), 4) + body; }

/// `error` as a reply carries it.
DecodingError carried(const DecodingError& error) {
  const auto reply = written([&](auto& out) { appendRejection(out, 1, error); });
  return parseRejection(parseReply(tightMessage(reply.substr(kLengthBytes))).body);
}

const std::string kHelloBody = "IRONMOAT\1\0\5\0\0\0\x08\x07\x06\x05\x04\x03\x02\x01"s +
                               number(2, 8) + number(3, 8) + number(4, 8) + number(512, 4);
const std::string kRequestBody = "\x2A\0\0\0\0\0\0\x80\x05Type1<msg>"s;
const std::string kRejectionBody = "\x07\0\0\0\0\0\0\0\1\2\x34\x12\0\0\0\0\0\0\x08\0mml[1].Uwhy"s;

TEST(Frame, ParsesWhatWasAppended) {
  const Hello hello{5, 0x0102030405060708, 2, 3, 4, 512};
  EXPECT_EQ(written([&](auto& out) { appendHello(out, hello); }), frame(kHelloBody));
  EXPECT_EQ(parseHello(tightMessage(kHelloBody)), hello);
  const Data body = tightMessage(kRequestBody);
  EXPECT_EQ(parseRequest(body).message.slice().block(), body.slice().block());  // not a copy

  const DecodingError rejection(Kind::typeMismatch, "mml[1].U", "why", 0x1234);
  EXPECT_EQ(written([&](auto& out) { appendRejection(out, 7, rejection); }), frame(kRejectionBody));
  EXPECT_EQ(carried(rejection).offset(), 0x1234U);
  EXPECT_FALSE(carried(DecodingError(Kind::keyNotFound, "", "")).offset().has_value());
  EXPECT_EQ(written([](auto& out) { appendDescription(out, 1, Status::failed, "why"); }),
            frame(number(1, 8) + "\3why"));
}

template <auto Parse>
void parse(const Data& body) {
  static_cast<void>(Parse(body));
}

TEST(Frame, RejectsInvalidBodies) {
  const std::string rejected = kRejectionBody.substr(9);
  const struct {
    void (*parse)(const Data&);
    std::string body;
    std::size_t accepted;  // of the prefixes of the body, itself included
  } rows[] = {
      {parse<parseHello>, kHelloBody + "x", 1},
      {parse<parseHello>, "IRONMOAX" + kHelloBody.substr(8), 0},
      {parse<parseHello>, "IRONMOAT\2\0"s + kHelloBody.substr(10), 0},
      {parse<parseRequest>, kRequestBody, 1 + 5},
      {parse<parseRequest>, number(1, 8) + "\0rest"s, 0},
      {parse<parseReply>, kRejectionBody, 1 + rejected.size()},
      {parse<parseReply>, number(1, 8) + "\3", 1},
      {parse<parseReply>, number(1, 8) + "\4", 0},
      {parse<parseRejection>, "\6" + rejected.substr(1), 1 + 3},
      {parse<parseRejection>, rejected, 1 + 3},
      {parse<parseRejection>, "\7" + rejected.substr(1), 0},
      {parse<parseRejection>, "\0"s + number(0, 8) + "\1\0\xC3\xA9"s, 0},
      {parse<parseRejection>, "\0"s + number(0, 8) + "\0\0\xC3"s, 1},
      {parse<parseDescription>, "zero\0byte"s, 1 + 4},
  };
  for (const auto& row : rows) {
    std::size_t accepted = 0;
    for (std::size_t length = 0; length <= row.body.size(); ++length) {
      try {
        row.parse(tightMessage(row.body.substr(0, length)));
        ++accepted;
      } catch (const FrameError&) {
      }
    }
    EXPECT_EQ(accepted, row.accepted) << ::testing::PrintToString(row.body);
  }
  EXPECT_NO_THROW(parse<parseDescription>(Data(std::string(65535, 'x'))));
  EXPECT_THROW(parse<parseDescription>(Data(std::string(65536, 'x'))), FrameError);
  for (std::size_t i = 0; i < 8 + 1 + 5; ++i) {
    EXPECT_EQ(requestId(tightMessage(kRequestBody.substr(0, i))).has_value(), i >= 8) << i;
  }
}

TEST(Frame, TruncatesTextAndRejectsWhatNoFrameCanHold) {
  const std::string path(65534, 'p');
  const DecodingError error = carried(DecodingError(Kind::malformed, path + "\xC3\xA9", "a\xFF z"));
  EXPECT_EQ(error.path(), path);
  EXPECT_STREQ(error.what(), "a");

  BlockBuilder out;
  EXPECT_THROW(appendRequestHead(out, 1, "", 0), FrameError);
  EXPECT_THROW(appendRequestHead(out, 1, std::string(256, 'n'), 0), FrameError);
  EXPECT_THROW(appendRequestHead(out, 1, "n", kMaxRequestBody), FrameError);
  EXPECT_EQ(out.size(), 0U);
  appendRequestHead(out, 1, std::string(255, 'n'), limits::messageBytes);
  EXPECT_EQ(out.size(), kMaxRequestHead);
  EXPECT_EQ(out.size() - kLengthBytes + limits::messageBytes, kMaxRequestBody);
  const std::size_t start = beginReply(out, 1, Status::record);
  out.extend(limits::replyBytes);
  endReply(out, start);
  EXPECT_EQ(out.size() - start - kLengthBytes, kMaxReplyBody);
}

/// Feeds `stream` in pieces of at most `piece` bytes; returns each body as soon as it is whole.
std::vector<Data> assembled(FrameAssembler& assembler, std::string_view stream, std::size_t piece) {
  std::vector<Data> bodies;
  while (!stream.empty()) {
    const std::span<char> room = assembler.room();
    const std::size_t count = std::min({piece, room.size(), stream.size()});
    EXPECT_GT(count, 0U);
    stream.copy(room.data(), count);
    stream.remove_prefix(count);
    assembler.commit(count);
    while (const auto body = assembler.next()) bodies.push_back(*body);
  }
  return bodies;
}

TEST(FrameAssembler, SplitsFramesWhereverReadsEnd) {
  std::vector<Data> expected;
  std::string stream;
  // Around the buffer's size, and small frames before and after large ones.
  for (const std::size_t size :
       {0, 1, 5, 65531, 65532, 65533, 3, 65536, 200000, 0, 7, 40000, 40000, 100, 1000000, 1}) {
    expected.emplace_back(std::string(size, static_cast<char>('a' + expected.size())));
    stream += frame(std::string(expected.back().view()));
  }
  for (const std::size_t piece : {1, 3, 1000, 65535, 65536, 4000000}) {
    std::vector<Data> bodies;
    {
      FrameAssembler assembler(1000000, Sharing::oneThread);
      bodies = assembled(assembler, stream, piece);
      EXPECT_FALSE(assembler.midFrame());
      EXPECT_TRUE(assembled(assembler, "\3"s, 1).empty());
      EXPECT_TRUE(assembler.midFrame());
    }
    EXPECT_TRUE(bodies == expected) << piece;
    EXPECT_NE(bodies[1].slice().block(), bodies[2].slice().block());
  }
}

TEST(FrameAssembler, AllocatesForBytesReceivedNotAnnounced) {
  FrameAssembler assembler(UINT32_MAX, Sharing::anyThread);
  EXPECT_TRUE(assembled(assembler, "\xFF\xFF\xFF\xFF+++"s, 7).empty());
  std::size_t received = 3;
  for (int i = 0; i < 8; ++i) {
    const std::size_t room = assembler.room().size();
    EXPECT_LE(room, std::max<std::size_t>(65536, received));
    assembler.commit(room);
    received += room;
    EXPECT_FALSE(assembler.next().has_value());
  }
}

TEST(FrameAssembler, RejectsFrameThatExceedsLimit) {
  FrameAssembler assembler(10, Sharing::anyThread);
  EXPECT_EQ(assembled(assembler, frame("0123456789") + "\x0B\0\0"s, 100).size(), 1U);
  EXPECT_THROW(assembled(assembler, "\0"s, 100), FrameError);
  EXPECT_THROW((void)assembler.next(), FrameError);
}

}  // namespace
}  // namespace ironmoat::frames
