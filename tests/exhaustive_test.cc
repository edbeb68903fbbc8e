// A message of each kind, in both forms: every beginning of it, every byte of it changed (S1), and
// all of them on eight threads at once (S7).

#include <gtest/gtest.h>

#include <array>
#include <latch>
#include <string>
#include <thread>
#include <vector>

#include "frames/record_codec.h"
#include "plist/encoder.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/web_tunnel.h"
#include "support/refusal.h"
#include "support/tight_message.h"
#include "support/wire_fields.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"

namespace ironmoat {

namespace {

using plist::Form;

/// The reply's body, or the refusal in words; nothing else comes out.
template <class Unpacker>
std::string outcome(const Data& message) {
  try {
    BlockBuilder out;
    frames::encodeRecord(Unpacker().unpack(message), out);
    return {out.bytes(), out.size()};
  } catch (const DecodingError& rejection) {
    return testing::inWords(rejection);
  }
}

template <class Wire>
std::string sample(Form form, double presence, std::uint64_t seed) {
  const auto record = testing::RecordGenerator(seed, presence).make<Wire>(1);
  std::string message(plist::PropertyListEncoder(form).encode(record).view());
  while (message.ends_with('\n')) message.pop_back();  // no part of what must be there
  return message;
}

/// No beginning is a message, and whatever is changed, there is a record or a refusal.
template <class Unpacker>
void damage(const std::string& good) {
  ASSERT_NO_THROW((void)Unpacker().unpack(testing::tightMessage(good)));
  for (std::size_t length = 0; length < good.size(); ++length) {
    const std::string cut = outcome<Unpacker>(testing::tightMessage(good.substr(0, length)));
    EXPECT_TRUE(cut.starts_with("malformed: ")) << length << ": " << cut;
  }
  for (std::size_t at = 0; at < good.size(); ++at) {
    for (unsigned change = 1; change < 256; ++change) {
#if defined(__SANITIZE_THREAD__)
      if ((change & (change - 1)) != 0) continue;  // single bits: there is one thread here
#endif
      std::string changed = good;
      changed[at] = static_cast<char>(changed[at] ^ static_cast<char>(change));
      outcome<Unpacker>(testing::tightMessage(changed));
    }
  }
}

TEST(ExhaustiveTest, EveryBeginningAndEveryByteOfAMessage) {
  for (const Form form : {Form::binary, Form::xml}) {
    damage<VeskCommandResponseUnpacker>(sample<VeskCommandResponseSchema>(form, 1, 1));
    damage<VeskCommandWebTunnelResponseUnpacker>(
        sample<VeskCommandWebTunnelResponseSchema>(form, 1, 2));
    damage<VeskCorvelPayloadUnpacker>(sample<VeskCorvelProtocolPayload>(form, 0.1, 3));
  }
}

/// The first use of every index of keys, too, when this test runs alone.
TEST(ThreadsTest, EightAtOnceGiveWhatEachGivesAlone) {
  std::vector<Data> messages;
  for (std::uint64_t seed = 0; seed < 4; ++seed) {
    for (const Form form : {Form::binary, Form::xml}) {
      messages.emplace_back(sample<VeskCorvelProtocolPayload>(form, 0.3, seed));
      messages.emplace_back(sample<VeskCommandResponseSchema>(form, 0.7, seed));
      messages.emplace_back(sample<VeskCommandWebTunnelResponseSchema>(form, 0.7, seed));
      messages.emplace_back(messages.back().view().substr(0, 40 + seed));
    }
  }
  const auto unpackAll = [&](std::size_t start) {
    std::vector<std::string> outcomes(messages.size());
    for (std::size_t i = 0; i < messages.size(); ++i) {
      const std::size_t which = (start + i) % messages.size();
      outcomes[which] = outcome<VeskCorvelPayloadUnpacker>(messages[which]) + "\n" +
                        outcome<VeskCommandResponseUnpacker>(messages[which]) + "\n" +
                        outcome<VeskCommandWebTunnelResponseUnpacker>(messages[which]);
    }
    return outcomes;
  };
  constexpr std::size_t kThreads = 8;
  std::array<std::vector<std::string>, kThreads> outcomes;
  std::latch start(kThreads);
  {
    std::vector<std::jthread> threads;
    for (std::size_t t = 0; t < kThreads; ++t) {
      threads.emplace_back([&, t] {
        start.arrive_and_wait();
        for (int rounds = 0; rounds < 5; ++rounds) outcomes[t] = unpackAll(t * 5);
      });
    }
  }
  const auto alone = unpackAll(0);
  for (const auto& one : outcomes) EXPECT_EQ(one, alone);
}

}  // namespace
}  // namespace ironmoat
