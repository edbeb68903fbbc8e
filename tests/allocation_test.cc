// Every allocation fails in turn, alone or with all later ones, in unpacking, in serving and in the
// client. (S6)
//
// This program's malloc, calloc, realloc and free are wrapped by the linker (--wrap), and operator
// new is replaced.

#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <functional>
#include <limits>
#include <new>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "frames/frame.h"
#include "frames/record_codec.h"
#include "host/server.h"
#include "plist/encoder.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/web_tunnel.h"
#include "support/clients.h"
#include "support/rejection.h"
#include "support/request_frame.h"
#include "support/wire_fields.h"
#include "support/written.h"
#include "support/xml_message.h"
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
void* __real_calloc(std::size_t count, std::size_t size);
void* __real_realloc(void* memory, std::size_t size);
void __real_free(void* memory);

void* __wrap_realloc(void* memory, std::size_t size) {
  if (fails()) return nullptr;
  if (memory == nullptr) ++live;
  return __real_realloc(memory, size);
}
void* __wrap_malloc(std::size_t size) { return __wrap_realloc(nullptr, size); }
void* __wrap_calloc(std::size_t count, std::size_t size) {
  if (fails()) return nullptr;
  ++live;
  return __real_calloc(count, size);
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

namespace ironmoat {

namespace {

namespace xml = testing::xml;

const std::string kNoMemory = "no memory";

/// The outcome that `act` returns, its rejection, or kNoMemory.
std::string outcomeOf(const std::function<std::string()>& act) {
  try {
    try {
      return act();
    } catch (const DecodingError& rejection) {
      return testing::inWords(rejection);  // may run out of memory as well
    }
  } catch (const std::bad_alloc&) {
    return kNoMemory;
  }
}

/// Runs `act` with each of its allocations failing in turn, until `calmRuns` in a row had none that
/// failed: threads race for the n-th. The outcome must then be kNoMemory or in `ranOut`,
/// which must come at least once, or in a race as usual; and nothing may stay allocated. Returns
/// the number of allocations.
long sweep(const std::function<std::string()>& act, const std::set<std::string>& ranOut,
           int calmRuns = 1) {
  const std::string usual = outcomeOf(act);
  long n = 0;
  for (const bool on : {true, false}) {
    bool worded = false;
    n = 0;
    for (int calm = 0; calm < calmRuns; ++n) {
      const long before = live;
      {
        failsOn = on;
        untilFailure = n;
        const std::string outcome = outcomeOf(act);
        const bool failed = untilFailure < 0;
        untilFailure = kNever;
        calm = failed ? 0 : calm + 1;
        const bool isUsual = outcome == usual && (!failed || calmRuns > 1);
        EXPECT_TRUE(isUsual || (failed && (outcome == kNoMemory || ranOut.contains(outcome))))
            << n << ": " << outcome;
        worded = worded || ranOut.contains(outcome);
      }
      EXPECT_EQ(live, before) << n << " of " << usual;
      if (::testing::Test::HasFailure()) return n;
    }
    EXPECT_TRUE(worded || on) << usual;
  }
  return n - calmRuns;
}

template <class Record>
std::string encoded(const Record& record) {
  return testing::written([&](BlockBuilder& out) { frames::encodeRecord(record, out); });
}

template <class Unpacker_, class Wire_>
struct Kind {
  using Unpacker = Unpacker_;
  using Wire = Wire_;
  using Output = typename Unpacker::MessageSchemaType;
};

/// Messages with all fields, few fields, and errors at the beginning and at the end.
template <class Wire>
std::vector<Data> messages() {
  std::vector<Data> all = {Data(), Data(std::string_view("bplist00"))};
  const Wire full = testing::RecordGenerator(1, 1).make<Wire>(2);
  const std::string c = xml::number("c", 1);
  const std::string texts = "<string>&#233;</string><true/>";
  const std::string bodies[] = {
      "<true/>", "<dict/>", xml::dictionary(c),
      xml::dictionary(c + xml::list("mml", {c + xml::entry("dal", xml::array(texts))}) +
                      xml::entry("h", xml::dictionary(xml::entry("ri", "<array/>"))))};
  for (const auto format : {plist::Format::binary, plist::Format::xml}) {
    const Data good = plist::PropertyListEncoder(format).encode(full);
    all.push_back(good);
    all.push_back(Data(good.view().substr(0, good.size() - 9)));
    for (const std::string& body : bodies) {
      plist::Document document;
      EXPECT_FALSE(plist::readXml(xml::message(body), document));
      all.push_back(format == plist::Format::xml ? writeXml(document) : writeBinary(document));
    }
  }
  return all;
}

template <class K>
class Allocation : public ::testing::Test {};
using Kinds =
    ::testing::Types<Kind<VeskCommandResponseUnpacker, VeskCommandResponseSchema>,
                     Kind<VeskCommandWebTunnelResponseUnpacker, VeskCommandWebTunnelResponseSchema>,
                     Kind<VeskCorvelPayloadUnpacker, VeskCorvelProtocolPayload>>;
TYPED_TEST_SUITE(Allocation, Kinds);

TYPED_TEST(Allocation, UnpackingAndServingSurviveEveryFailure) {
  using Output = typename TypeParam::Output;
  IronmoatServer server(IronmoatServer::Sandboxed::no);
  server.registerUnpacker<Output>(typename TypeParam::Unpacker());
  long allocations = 0;
  for (const Data& message : messages<typename TypeParam::Wire>()) {
    allocations +=
        sweep([&] { return encoded(typename TypeParam::Unpacker().unpack(message)); }, {kNoMemory});
    const std::string frame = testing::written([&](BlockBuilder& out) {
      frames::appendRequest(out, 7, Output::schemaName, message.view());
    });
    const Data request(std::string_view(frame).substr(frames::kLengthBytes));
    const std::string ranOut = testing::written([&](BlockBuilder& out) {
      frames::appendRejection(
          out, 7,
          {DecodingError::Kind::notEnoughMemory, "", "not enough memory to decode this message"});
    });
    sweep([&] { return testing::written([&](BlockBuilder& out) { server.serve(request, out); }); },
          {ranOut});
  }
  EXPECT_GT(allocations, 40);
}

TYPED_TEST(Allocation, DecodingRepliesSurvivesEveryFailure) {
  using Output = typename TypeParam::Output;
  const std::string record = encoded(testing::RecordGenerator(2, 1).make<Output>(2));
  EXPECT_GT(sweep([&] { return encoded(frames::decodeRecord<Output>(Data(record))); }, {kNoMemory}),
            2);
}

TEST(ClientAllocation, RequestGetsAnOutcomeWhicheverAllocationFails) {
  const std::pair<const char*, std::string> rows[] = {
      {FAKE_SERVICE, "answer 7"},
      {FAKE_SERVICE, "exit 3"},
      {FAKE_SERVICE, "reply \2a reason of more than a few characters"},
      {"/nowhere/that/is/longer/than/a/few/characters", ""},
  };
  for (const auto& row : rows) {
    for (const bool waits : {true, false}) {
      const auto act = [&]() -> std::string {
        Client client(testing::optionsFor(row.first));
        const Data data{std::string_view(row.second)};
        const auto outcome = waits ? client.tryUnpack<VeskCommandResponse>(data)
                                   : client.submit<VeskCommandResponse>(data).outcome();
        if (outcome) return std::to_string(outcome->command);
        const ServiceError* const error = outcome.serviceError();
        return error == nullptr ? kNoMemory : std::string(nameOf(error->kind()));
      };
      sweep(act, {"unavailable", "crashed"}, 3);
    }
  }
}

}  // namespace
}  // namespace ironmoat
