#include "frames/record_codec.h"

#include <gtest/gtest.h>
#include <pthread.h>

#include <cstring>
#include <functional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "ironmoat/command_response.h"
#include "ironmoat/limits.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "support/tight_message.h"

namespace ironmoat {

namespace {
std::vector<std::string> made;  // the initialisers called since the last clear()
std::string refused;            // the record whose initialiser throws

void called(const char* record) {
  made.emplace_back(record);
  if (record == refused) throw std::runtime_error("refused");
}
}  // namespace

// Initialisers that record their calls, in the place of the host's.
void admit(const VeskCommandResponseArguments&) { called("VeskCommandResponse"); }
void admit(const VeskCommandWebTunnelResponseArguments&) { called("VeskCommandWebTunnelResponse"); }
void admit(const DrelUserPayloadHttpHeadersArguments&) { called("DrelUserPayloadHttpHeaders"); }
void admit(const DrelUserPayloadDeliveryContextArguments&) {
  called("DrelUserPayloadDeliveryContext");
}
void admit(const DrelHoplinePluginRequestArguments&) { called("DrelHoplinePluginRequest"); }
void admit(const DrelHoplineAllocationStatusArguments&) { called("DrelHoplineAllocationStatus"); }
void admit(const DrelHoplineSelfAllocTokenArguments&) { called("DrelHoplineSelfAllocToken"); }
void admit(const DrelHoplinePluginAllocationArguments&) { called("DrelHoplinePluginAllocation"); }
void admit(const DrelUserPayloadArguments&) { called("DrelUserPayload"); }

namespace frames {
namespace {

using namespace std::string_literals;
using Payload = DrelUserPayload;
using Arguments = DrelUserPayloadArguments;

template <class R>
std::string encoded(const R& record) {
  BlockBuilder out;
  encodeRecord(record, out);
  return std::string(out.bytes(), out.size());
}

template <class R>
std::string recoded(const std::string& body) {
  return encoded(decodeRecord<R>(testing::tightMessage(body)));
}

/// Fills fields with values that differ from one another, and from what a fresh field holds.
class Sampler {
 public:
  explicit Sampler(int depth) : depth_(depth) {}

  /// A record with the fields for which `chosen(index)` holds; the required ones always.
  template <class R>
  R record(const std::function<bool(std::size_t)>& chosen = [](std::size_t) { return true; }) {
    typename R::Arguments arguments;
    std::size_t i = 0;
    R::Arguments::Fields::forEach([&](auto field) {
      if (chosen(i++)) fill(field.in(arguments));
    });
    return R::with(std::move(arguments));
  }

 private:
  void fill(Int& to) { to = -(++count_ << 40); }
  void fill(Int64& to) { to = ++count_ << 50; }
  void fill(Bool& to) { to = ++count_ % 2 != 0; }
  void fill(String& to) { to = String("t\xC3\xA9xt" + std::to_string(++count_)); }
  void fill(Data& to) { to = Data(std::string_view("\0\xFF\x80", ++count_ % 4)); }
  template <class T>
  void fill(Optional<T>& to) {
    if constexpr (requires { typename T::Arguments; }) {
      to = record<T>();
    } else {
      T value{};
      fill(value);
      to = std::move(value);
    }
  }
  template <class T>
  void fill(List<T>& to) {
    if constexpr (std::is_same_v<T, Payload>) {
      if (depth_ == 0) return;
      --depth_;
    }
    for (int i = 0; i < 2; ++i) {
      if constexpr (requires { typename T::Arguments; }) {
        to.push_back(record<T>());
      } else {
        fill(to.emplace_back());
      }
    }
    if constexpr (std::is_same_v<T, Payload>) ++depth_;
  }

  int depth_;
  long count_ = 0;
};

/// Holds field by field, so that a codec that loses a field both ways does not pass.
template <class T>
bool same(const T& a, const T& b);
template <class T>
bool same(const Optional<T>& a, const Optional<T>& b) {
  return a.has_value() == b.has_value() && (!a || same(*a, *b));
}
template <class T>
bool same(const List<T>& a, const List<T>& b) {
  bool equal = a.size() == b.size();
  for (std::size_t i = 0; equal && i < a.size(); ++i) equal = same(a[i], b[i]);
  return equal;
}
template <class T>
bool same(const T& a, const T& b) {
  if constexpr (requires { typename T::Arguments; }) {
    bool equal = true;
    T::Arguments::Fields::forEach(
        [&](auto field) { equal = equal && same(field.in(a), field.in(b)); });
    return equal;
  } else {
    return a == b;
  }
}

template <class R>
void expectRoundTrips() {
  for (std::size_t only = 0; only < R::Arguments::Fields::count; ++only) {
    const R record = Sampler(1).record<R>([&](std::size_t i) { return i == only; });
    EXPECT_TRUE(same(decodeRecord<R>(testing::tightMessage(encoded(record))), record))
        << R::Arguments::Fields::names[only];
  }
  for (const std::size_t step : {1, 2, 3, 11}) {
    const R record = Sampler(2).record<R>([&](std::size_t i) { return i % step == 0; });
    EXPECT_TRUE(same(decodeRecord<R>(testing::tightMessage(encoded(record))), record)) << step;
  }
}

TEST(RecordCodecTest, EveryFieldCrosses) {
  expectRoundTrips<VeskCommandResponse>();
  expectRoundTrips<VeskCommandWebTunnelResponse>();
  expectRoundTrips<Payload>();
}

const std::string kHeaders = "\x05\x01\0\0\0h\0\0\0\0"s;  // fields 0 and 2 of 6
const std::string kCommand = "\x2A\0\0\0\0\0\0\x80"s;

TEST(RecordCodecTest, RecordsAreLaidOutAsDescribed) {
  VeskCommandWebTunnelResponseArguments arguments;
  arguments.command = INT64_MIN + 42;
  arguments.contentType = String("a\xC3\xA9");
  DrelUserPayloadHttpHeadersArguments headers;
  headers.adhocServiceOverride = String("h");
  headers.strictTransportSecurity = String();
  arguments.httpHeaders = DrelUserPayloadHttpHeaders::with(std::move(headers));
  const auto response = VeskCommandWebTunnelResponse::with(std::move(arguments));
  EXPECT_EQ(encoded(response), "\x91\0"s + kCommand + "\3\0\0\0a\xC3\xA9"s + kHeaders);

  const Data body = testing::tightMessage("\x91\0"s + kCommand + "\3\0\0\0a\xC3\xA9"s + kHeaders);
  const auto back = decodeRecord<VeskCommandWebTunnelResponse>(body);
  EXPECT_TRUE(same(back, response));
  EXPECT_GE(back.contentType->view().data(), body.view().data());  // a slice, not a copy
  EXPECT_LT(back.contentType->view().data(), body.view().data() + body.size());
}

TEST(RecordCodecTest, BytesThatBreakTheRulesAreRefused) {
  const std::string rest = kCommand;
  const struct {
    std::string body;
    const char* sentence;
  } rows[] = {
      {"", "the record ends too early"},
      {"\0\0"s + rest, "a field that every record has is missing"},
      {"\x01\x20"s + rest, "a field that no record has is present"},
      {"\x01\0"s + rest + "x", "bytes follow the record"},
      {"\x01\0"s + rest.substr(1), "the record ends too early"},
      {"\x41\0"s + rest + "\2"s, "a truth value is neither 0 nor 1"},
      {"\x01\1"s + rest + "\2\0\0\0\xC3("s, "a text is not valid UTF-8"},
      {"\x01\1"s + rest + "\xFF\xFF\xFF\xFFxyz"s, "the record ends too early"},
      {"\x05\0"s + rest + "\4\0\0\0xyz"s, "the record ends too early"},
      {"\x05\0"s + rest + "\3\0\0"s, "the record ends too early"},
  };
  for (const auto& row : rows) {
    try {
      (void)decodeRecord<VeskCommandResponse>(testing::tightMessage(row.body));
      ADD_FAILURE() << ::testing::PrintToString(row.body);
    } catch (const RecordError& error) {
      EXPECT_STREQ(error.what(), row.sentence) << ::testing::PrintToString(row.body);
    }
  }
}

/// Either refused, or exactly what the record that comes out is written as.
template <class R>
void expectRefusedOrSame(const std::string& body) {
  try {
    ASSERT_EQ(recoded<R>(body), body);
  } catch (const RecordError&) {
  }
}

template <class R>
void mutate() {
  const std::string good = encoded(Sampler(1).record<R>());
  const std::size_t step = good.size() / 500 + 1;
  for (std::size_t i = 0; i < good.size(); i += step) {
    EXPECT_THROW((void)decodeRecord<R>(testing::tightMessage(good.substr(0, i))), RecordError) << i;
    for (int bit = 0; bit < 8; ++bit) {
      std::string bad = good;
      bad[i] = static_cast<char>(bad[i] ^ (1 << bit));
      expectRefusedOrSame<R>(bad);
    }
    for (const auto& lie : {"\xFF\xFF\xFF\xFF"s, "\0\0\0\x80"s, "\0\0\1\0"s, "\1\0\0\0"s, ""s}) {
      if (i + 4 > good.size()) continue;
      expectRefusedOrSame<R>(std::string(good).replace(i, 4, lie));
      expectRefusedOrSame<R>(std::string(good).insert(i, lie));
    }
  }
}

TEST(RecordCodecTest, NoMutationIsTakenForAnotherRecord) {
  mutate<VeskCommandResponse>();
  mutate<VeskCommandWebTunnelResponse>();
  mutate<Payload>();
}

/// `depth` payloads inside one another, the outermost counted.
Payload nested(std::uint32_t depth) {
  Payload payload = Payload::with({});
  for (std::uint32_t i = 1; i < depth; ++i) {
    Arguments outer;
    outer.corvelMessageList.push_back(std::move(payload));
    payload = Payload::with(std::move(outer));
  }
  return payload;
}

#if defined(NDEBUG) && !defined(__SANITIZE_ADDRESS__) && !defined(__SANITIZE_THREAD__)
constexpr std::size_t kSmallStack = std::size_t{512} << 10;
#else
constexpr std::size_t kSmallStack = std::size_t{16} << 20;  // frames are many times as large
#endif

void onSmallStack(std::function<void()> work) {
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
  ASSERT_EQ(pthread_attr_setstacksize(&attributes, kSmallStack), 0);
  pthread_t thread;
  const auto run = [](void* argument) -> void* {
    (*static_cast<std::function<void()>*>(argument))();
    return nullptr;
  };
  ASSERT_EQ(pthread_create(&thread, &attributes, run, &work), 0);
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
}

TEST(RecordCodecTest, DepthIsBoundedAndFitsASmallStack) {
  onSmallStack([] {
    const std::string deepest = encoded(nested(limits::nestedContainers));
    EXPECT_EQ(recoded<Payload>(deepest), deepest);
    EXPECT_THROW((void)encoded(nested(limits::nestedContainers + 1)), RecordError);

    // Deeper than can be written: what a payload puts before and behind the one inside it.
    const std::string two = encoded(nested(2));
    const std::string one = encoded(nested(1));
    const std::size_t before = two.find(one, 1);
    ASSERT_NE(before, std::string::npos);
    const std::string opening = two.substr(0, before);
    const std::string closing = two.substr(before + one.size());
    std::string tooDeep;
    for (int i = 0; i < 100000; ++i) tooDeep += opening;
    EXPECT_THROW((void)decodeRecord<Payload>(testing::tightMessage(tooDeep)), RecordError);
    EXPECT_THROW((void)decodeRecord<Payload>(testing::tightMessage(opening + deepest + closing)),
                 RecordError);
  });
}

TEST(RecordCodecTest, ListsAreBoundedByTheMemoryTheyTake) {
  const std::size_t most = limits::recordBytes / sizeof(Payload);
  for (const bool split : {false, true}) {
    Arguments arguments;
    for (std::size_t i = 0; i + 1 < most; ++i) {
      (split && i % 2 == 0 ? arguments.dstIdTokenList : arguments.corvelMessageList)
          .push_back(Payload::with({}));
    }
    arguments.corvelMessageList.push_back(Payload::with({}));
    made.clear();
    const std::string full = encoded(Payload::with(arguments));
    EXPECT_EQ(recoded<Payload>(full), full);
    arguments.corvelMessageList.push_back(Payload::with({}));
    EXPECT_THROW((void)decodeRecord<Payload>(
                     testing::tightMessage(encoded(Payload::with(std::move(arguments))))),
                 RecordError);
  }
}

TEST(RecordCodecTest, TextAndDataAreBoundedInAll) {
  VeskCommandResponseArguments arguments;
  arguments.token = Data(std::string(limits::deliveredBytes - 1, 'x'));
  arguments.applicationId = String("y");
  const std::string full = encoded(VeskCommandResponse::with(arguments));
  EXPECT_EQ(recoded<VeskCommandResponse>(full), full);
  arguments.applicationId = String("yz");
  const std::string over = encoded(VeskCommandResponse::with(arguments));
  EXPECT_THROW((void)decodeRecord<VeskCommandResponse>(testing::tightMessage(over)), RecordError);

  arguments.messageUUID = arguments.veskSessionId = arguments.token;
  EXPECT_THROW((void)encoded(VeskCommandResponse::with(std::move(arguments))), RecordError);
}

TEST(RecordCodecTest, InitialisersRunChildrenFirstAndMayRefuse) {
  Arguments inner{};
  inner.allocationStatuses.push_back(DrelHoplineAllocationStatus::with({}));
  inner.httpHeaders = DrelUserPayloadHttpHeaders::with({});
  Arguments outer{};
  outer.corvelMessageList.push_back(Payload::with(std::move(inner)));
  outer.deliveryContext = DrelUserPayloadDeliveryContext::with({});
  const Data body = testing::tightMessage(encoded(Payload::with(std::move(outer))));

  made.clear();
  (void)decodeRecord<Payload>(body);
  EXPECT_EQ(made, (std::vector<std::string>{
                      "DrelUserPayloadDeliveryContext", "DrelUserPayloadHttpHeaders",
                      "DrelHoplineAllocationStatus", "DrelUserPayload", "DrelUserPayload"}));
  refused = "DrelHoplineAllocationStatus";
  EXPECT_THROW((void)decodeRecord<Payload>(body), std::runtime_error);
  refused.clear();
}

}  // namespace
}  // namespace frames
}  // namespace ironmoat
