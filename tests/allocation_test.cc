// What becomes of a message when memory runs out at any point: the n-th allocation fails for every
// n, once or from there on, in unpacking, in serving and in the client. (S6)
//
// The linker leads this program's malloc and its like here (--wrap); operator new is replaced.

#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <functional>
#include <limits>
#include <new>
#include <string>
#include <string_view>
#include <vector>

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "frames/record_codec.h"
#include "host/server.h"
#include "ironmoat/client.h"
#include "plist/encoder.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/web_tunnel.h"
#include "support/refusal.h"
#include "support/wire_fields.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"

namespace {

constexpr long kNever = std::numeric_limits<long>::max();
std::atomic<long> untilFailure = kNever;  // allocations that still succeed
std::atomic<bool> failsOn = false;        // the later ones fail as well
std::atomic<long> live = 0;

bool fails() {
  if (untilFailure.load(std::memory_order_relaxed) == kNever) return false;
  const long left = untilFailure.fetch_sub(1, std::memory_order_relaxed);
  return failsOn ? left <= 0 : left == 0;
}

}  // namespace

extern "C" {
// NOLINTBEGIN(bugprone-reserved-identifier): as the linker calls them
void* __real_malloc(std::size_t size);
void* __real_calloc(std::size_t count, std::size_t size);
void* __real_realloc(void* memory, std::size_t size);
void __real_free(void* memory);
void* __wrap_malloc(std::size_t size);
void* __wrap_calloc(std::size_t count, std::size_t size);
void* __wrap_realloc(void* memory, std::size_t size);
void __wrap_free(void* memory);

void* __wrap_malloc(std::size_t size) {
  if (fails()) return nullptr;
  ++live;
  return __real_malloc(size);
}
void* __wrap_calloc(std::size_t count, std::size_t size) {
  if (fails()) return nullptr;
  ++live;
  return __real_calloc(count, size);
}
void* __wrap_realloc(void* memory, std::size_t size) {
  if (fails()) return nullptr;
  if (memory == nullptr) ++live;
  return __real_realloc(memory, size);
}
void __wrap_free(void* memory) {
  if (memory != nullptr) --live;
  __real_free(memory);
}
// NOLINTEND(bugprone-reserved-identifier)
}

void* operator new(std::size_t size) {
  void* memory = __wrap_malloc(size == 0 ? 1 : size);
  if (memory == nullptr) throw std::bad_alloc();
  return memory;
}
void* operator new[](std::size_t size) { return operator new(size); }
void* operator new(std::size_t size, const std::nothrow_t&) noexcept { return __wrap_malloc(size); }
void operator delete(void* memory) noexcept { __wrap_free(memory); }
void operator delete[](void* memory) noexcept { __wrap_free(memory); }
void operator delete(void* memory, std::size_t) noexcept { __wrap_free(memory); }
void operator delete[](void* memory, std::size_t) noexcept { __wrap_free(memory); }
void operator delete(void* memory, const std::nothrow_t&) noexcept { __wrap_free(memory); }

namespace ironmoat {

namespace {

const std::string kNoMemory = "no memory";

/// What came of `act`, which returns it; no exception but std::bad_alloc and DecodingError passes.
std::string outcomeOf(const std::function<std::string()>& act) {
  try {
    try {
      return act();
    } catch (const DecodingError& refusal) {
      return testing::inWords(refusal);  // may run out of memory, too
    }
  } catch (const std::bad_alloc&) {
    return kNoMemory;
  }
}

/// `act` with each of its allocations failing: the outcome is then that memory ran out, at least
/// once in the given words, and nothing stays allocated. Returns how many allocations there are.
long sweep(const std::function<std::string()>& act, const std::string& ranOut = kNoMemory) {
  const std::string usual = outcomeOf(act);
  long allocations = 0;
  for (const bool on : {false, true}) {
    bool worded = false;
    for (long n = 0;; ++n) {
      const long before = live;
      {
        failsOn = on;
        untilFailure = n;
        const std::string outcome = outcomeOf(act);
        const bool failed = untilFailure < 0;
        untilFailure = kNever;
        if (!failed) {
          EXPECT_EQ(outcome, usual);
          allocations = n;
          break;
        }
        EXPECT_TRUE(outcome == kNoMemory || outcome == ranOut) << n << ": " << outcome;
        worded = worded || outcome == ranOut;
      }
      EXPECT_EQ(live, before) << n << " of " << usual;
      if (::testing::Test::HasFailure()) return n;
    }
    EXPECT_TRUE(worded || on) << usual;
  }
  return allocations;
}

Data written(const plist::Document& document, plist::Form form) {
  return form == plist::Form::xml ? writeXml(document) : writeBinary(document);
}
Data message(std::string_view xml, plist::Form form) {
  plist::Document document;
  EXPECT_FALSE(plist::readXml(Data(xml), document));
  return written(document, form);
}

template <class Unpacker_, class Wire_>
struct Kind {
  using Unpacker = Unpacker_;
  using Wire = Wire_;
  using Output = typename Unpacker::MessageSchemaType;
};

/// Every field, and what goes wrong early, late and at the first look.
template <class Wire>
std::vector<Data> messages() {
  std::vector<Data> all = {Data(), Data(std::string_view("bplist00"))};
  const Wire full = testing::RecordGenerator(1, 1).make<Wire>(2);
  for (const auto form : {plist::Form::binary, plist::Form::xml}) {
    const Data good = plist::PropertyListEncoder(form).encode(full);
    all.push_back(good);
    all.push_back(Data(good.view().substr(0, good.size() - 9)));
    for (const std::string_view body :
         {"<dict><key>c</key><integer>1</integer></dict>", "<dict/>", "<true/>",
          "<dict><key>c</key><integer>1</integer><key>mml</key><array><dict><key>c</key>"
          "<integer>2</integer><key>dal</key><array><string>&#233;</string><true/></array></dict>"
          "</array><key>s</key><string/><key>h</key><dict><key>ri</key><date>2000-01-01T00:00:00Z"
          "</date></dict></dict>"}) {
      const std::string text = "<plist>" + std::string(body) + "</plist>";
      if (text.find("date") == std::string::npos) {
        all.push_back(message(text, form));
      } else {
        all.emplace_back(std::string_view(text));
      }
    }
  }
  return all;
}

template <class K>
class AllocationTest : public ::testing::Test {};
using Kinds =
    ::testing::Types<Kind<VeskCommandResponseUnpacker, VeskCommandResponseSchema>,
                     Kind<VeskCommandWebTunnelResponseUnpacker, VeskCommandWebTunnelResponseSchema>,
                     Kind<VeskCorvelPayloadUnpacker, VeskCorvelProtocolPayload>>;
TYPED_TEST_SUITE(AllocationTest, Kinds);

TYPED_TEST(AllocationTest, UnpackingAndServing) {
  using Output = typename TypeParam::Output;
  IronmoatServer server(IronmoatServer::Confine::no);
  server.registerUnpacker<Output>(typename TypeParam::Unpacker());
  long allocations = 0;
  for (const Data& message : messages<typename TypeParam::Wire>()) {
    allocations += sweep([&] {
      BlockBuilder reply;
      frames::encodeRecord(typename TypeParam::Unpacker().unpack(message), reply);
      return std::string(reply.bytes(), reply.size());
    });
    BlockBuilder frame;
    frames::appendRequest(frame, 7, Output::schemaName, message.view());
    const Data request(std::string_view(frame.bytes(), frame.size()).substr(frames::kLengthBytes));
    const auto serve = [&] {
      BlockBuilder reply;
      server.serve(request, reply);
      return std::string(reply.bytes(), reply.size());
    };
    BlockBuilder ranOut;
    frames::appendRefusal(
        ranOut, 7,
        {DecodingError::Kind::notEnoughMemory, "", "not enough memory to decode this message"});
    sweep(serve, {ranOut.bytes(), ranOut.size()});
  }
  EXPECT_GT(allocations, 40);
}

TYPED_TEST(AllocationTest, DecodingReplies) {
  using Output = typename TypeParam::Output;
  BlockBuilder reply;
  const std::size_t start = frames::beginReply(reply, 1, frames::Status::record);
  frames::encodeRecord(testing::RecordGenerator(2, 1).make<Output>(2), reply);
  frames::endReply(reply, start);
  frames::appendRefusal(reply, 2, {DecodingError::Kind::malformed, "a.b", "a sentence", 5});
  frames::appendSentence(reply, 3, frames::Status::failed, "a sentence that no string holds");
  const std::string_view stream(reply.bytes(), reply.size());
  EXPECT_GT(sweep([&] {
              frames::FrameAssembler assembler(frames::kMaxReplyBody, Sharing::anyThread);
              std::string_view left = stream;
              std::string all;
              while (!left.empty()) {
                const auto room = assembler.room();
                const std::size_t count = std::min(room.size(), left.size());
                left.copy(room.data(), count);
                left.remove_prefix(count);
                assembler.commit(count);
                while (const auto body = assembler.next()) {
                  const frames::Reply one = frames::parseReply(*body);
                  if (one.status == frames::Status::record) {
                    BlockBuilder again;
                    frames::encodeRecord(frames::decodeRecord<Output>(one.body), again);
                    all.append(again.bytes(), again.size());
                  } else if (one.status == frames::Status::refused) {
                    all += frames::parseRefusal(one.body).path();
                  } else {
                    all += frames::parseSentence(one.body);
                  }
                }
              }
              return all;
            }),
            8);
}

/// The daemon's side with all its threads, from no service to an outcome and back to none.
TEST(AllocationClientTest, FromNoServiceToAnOutcome) {
  const struct {
    const char* program;
    const char* message;
    std::string outcome;
  } rows[] = {
      {TEST_SERVER, "echo 7", "command 7"},
      {TEST_SERVER, "crash", "crashed"},
      {SERVICE, "junk of more than a few characters", "malformed: no plist element at offset 0"},
      {"/nowhere/that/is/longer/than/a/few/characters", "", "unavailable"},
  };
  for (const auto& row : rows) {
    for (const bool waits : {true, false}) {
      const auto act = [&]() -> std::string {
        Client::Options options;
        options.program = row.program;
        Client client(options);
        const Data message{std::string_view(row.message)};
        try {
          const auto record = waits ? client.unpack<VeskCommandResponse>(message)
                                    : client.submit<VeskCommandResponse>(message).get();
          return "command " + std::to_string(record.command);
        } catch (const ServiceError& error) {
          return error.kind() == ServiceError::Kind::crashed ? "crashed" : "unavailable";
        }
      };
      ASSERT_EQ(outcomeOf(act), row.outcome);
      for (const bool on : {false, true}) {
        // Threads race for the n-th allocation: the sweep ends when there was none some times.
        for (long n = 0, unharmed = 0; unharmed < 3; ++n) {
          const long before = live;
          {
            failsOn = on;
            untilFailure = n;
            const std::string outcome = outcomeOf(act);
            unharmed = untilFailure < 0 ? 0 : unharmed + 1;
            untilFailure = kNever;
            EXPECT_TRUE(outcome == row.outcome || outcome == kNoMemory ||
                        outcome == "unavailable" || outcome == "crashed")
                << n << ": " << outcome;
          }
          EXPECT_EQ(live, before) << n << " of " << row.message;
          if (HasFailure()) return;
        }
      }
    }
  }
}

}  // namespace
}  // namespace ironmoat
