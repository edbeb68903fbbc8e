// Unpacking shares nothing that a thread writes (S7), and takes little stack (S8).

#include <gtest/gtest.h>
#include <pthread.h>

#include <array>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "frames/record_codec.h"
#include "ironmoat/limits.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "support/rejection.h"
#include "support/written.h"
#include "support/xml_message.h"
#include "unpackers/command_response_unpacker.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "unpackers/web_tunnel_response_unpacker.h"

namespace ironmoat {
namespace {

namespace xml = testing::xml;
using Outcomes = std::vector<std::string>;

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr std::size_t kStack = std::size_t{8} << 20;  // sanitizers widen every frame
#else
constexpr std::size_t kStack = std::size_t{1} << 20;
#endif

/// The body of the reply, decoded and encoded again, or the rejection.
template <class Unpacker>
std::string outcome(const Data& message) {
  const auto encoded = [](const auto& record) {
    return testing::written([&](BlockBuilder& out) { frames::encodeRecord(record, out); });
  };
  try {
    const std::string body = encoded(Unpacker().unpack(message));
    const Data reply(std::string_view{body});
    return encoded(frames::decodeRecord<typename Unpacker::MessageSchemaType>(reply));
  } catch (const DecodingError& rejection) {
    return testing::inWords(rejection);
  }
}

/// The deepest valid payload in both formats, and all test vectors.
std::vector<Data> messages() {
  std::string payload = xml::number("c", 0);
  for (std::size_t level = 1; level < limits::nestedContainers / 2; ++level) {
    payload = xml::number("c", 1) + xml::list(level % 2 == 0 ? "mml" : "dtl", {payload});
  }
  std::vector<Data> all = {xml::message(xml::dictionary(payload))};
  plist::Document document;
  EXPECT_FALSE(plist::readXml(all[0], document));
  all.push_back(writeBinary(document));
  for (const auto& file : std::filesystem::recursive_directory_iterator(VECTORS)) {
    if (!file.is_regular_file()) continue;
    std::ifstream stream(file.path(), std::ios::binary);
    all.emplace_back(std::string(std::istreambuf_iterator(stream), {}));
  }
  return all;
}

Outcomes outcomes() {
  Outcomes all;
  for (const Data& message : messages()) {
    all.push_back(outcome<VeskCorvelPayloadUnpacker>(message));
    all.push_back(outcome<VeskCommandResponseUnpacker>(message));
    all.push_back(outcome<VeskCommandWebTunnelResponseUnpacker>(message));
  }
  return all;
}

TEST(Unpackers, GiveTheSameOutcomesOnEightSmallStacksAtOnce) {
  pthread_attr_t small;
  ASSERT_EQ(pthread_attr_init(&small) + pthread_attr_setstacksize(&small, kStack), 0);
  std::array<Outcomes, 8> found;
  std::array<pthread_t, 8> threads{};
  const auto start = [](void* mine) -> void* {
    *static_cast<Outcomes*>(mine) = outcomes();
    return nullptr;
  };
  // They also build the key indices, if this test runs alone.
  for (std::size_t i = 0; i < found.size(); ++i) {
    ASSERT_EQ(pthread_create(&threads[i], &small, start, &found[i]), 0);
  }
  for (const pthread_t thread : threads) pthread_join(thread, nullptr);
  const Outcomes expected = outcomes();
  for (const Outcomes& each : found) EXPECT_TRUE(each == expected);
  EXPECT_FALSE(expected[0].starts_with("limitExceeded")) << "is the deepest, and fits";
  EXPECT_EQ(expected[0], expected[3]) << "of the other format";
}

}  // namespace
}  // namespace ironmoat
