// Unpacking shares nothing that a thread writes. (S7)

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
#include "support/rejection.h"
#include "support/wire_fields.h"
#include "support/written.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"

namespace ironmoat {
namespace {

template <class Unpacker>
std::string outcome(const Data& message) {
  try {
    return testing::written(
        [&](BlockBuilder& out) { frames::encodeRecord(Unpacker().unpack(message), out); });
  } catch (const DecodingError& rejection) {
    return testing::inWords(rejection);
  }
}

std::vector<std::string> outcomes(const Data& message) {
  return {outcome<VeskCorvelPayloadUnpacker>(message),
          outcome<VeskCommandResponseUnpacker>(message),
          outcome<VeskCommandWebTunnelResponseUnpacker>(message)};
}

template <class Wire>
Data sample(plist::Format format, std::uint64_t seed) {
  const auto record = testing::RecordGenerator(seed, 0.5).make<Wire>(1);
  return plist::PropertyListEncoder(format).encode(record);
}

/// When this test runs alone, the threads also build the key indices.
TEST(Unpackers, GiveTheSameOutcomesOnEightThreadsAtOnce) {
  std::vector<Data> messages;
  for (const auto format : {plist::Format::binary, plist::Format::xml}) {
    messages.push_back(sample<VeskCorvelProtocolPayload>(format, 1));
    messages.push_back(sample<VeskCommandResponseSchema>(format, 2));
    messages.push_back(sample<VeskCommandWebTunnelResponseSchema>(format, 3));
    messages.emplace_back(messages.back().view().substr(0, 40));
  }
  constexpr std::size_t kThreads = 8;
  std::array<std::vector<std::vector<std::string>>, kThreads> found;
  std::latch start(kThreads);
  {
    std::vector<std::jthread> threads;
    for (auto& mine : found) {
      threads.emplace_back([&] {
        start.arrive_and_wait();
        for (int round = 0; round < 20; ++round) {
          mine.clear();
          for (const Data& message : messages) mine.push_back(outcomes(message));
        }
      });
    }
  }
  for (std::size_t i = 0; i < messages.size(); ++i) {
    for (const auto& each : found) EXPECT_EQ(each[i], outcomes(messages[i])) << i;
  }
}

}  // namespace
}  // namespace ironmoat
