// The deepest valid message passes through every stage on a stack of one megabyte. (S8)

#include <gtest/gtest.h>
#include <pthread.h>

#include <functional>
#include <string>

#include "frames/record_codec.h"
#include "ironmoat/limits.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "support/written.h"
#include "support/xml_message.h"
#include "unpackers/corvel_payload_unpacker.h"

namespace ironmoat {
namespace {

namespace xml = testing::xml;

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr std::size_t kStack = std::size_t{8} << 20;  // sanitizers widen every frame
#else
constexpr std::size_t kStack = std::size_t{1} << 20;
#endif

void onSmallStack(std::function<void()> act) {
  pthread_attr_t attributes;
  ASSERT_EQ(pthread_attr_init(&attributes), 0);
  ASSERT_EQ(pthread_attr_setstacksize(&attributes, kStack), 0);
  pthread_t thread{};
  const auto start = [](void* what) -> void* {
    (*static_cast<std::function<void()>*>(what))();
    return nullptr;
  };
  ASSERT_EQ(pthread_create(&thread, &attributes, start, &act), 0);
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
}

std::string encoded(const DrelUserPayload& record) {
  return testing::written([&](BlockBuilder& out) { frames::encodeRecord(record, out); });
}

TEST(Nesting, DeepestPayloadFitsInAMegabyteOfStack) {
  onSmallStack([] {
    std::string payload = xml::number("c", 0);
    for (std::size_t level = 1; level < limits::nestedContainers / 2; ++level) {
      payload = xml::number("c", 1) + xml::list(level % 2 == 0 ? "mml" : "dtl", {payload});
    }
    const Data message = xml::message(xml::dictionary(payload));
    plist::Document document;
    ASSERT_FALSE(plist::readXml(message, document));
    for (const Data& each : {message, writeBinary(document)}) {
      const std::string carried = encoded(VeskCorvelPayloadUnpacker().unpack(each));
      EXPECT_EQ(encoded(frames::decodeRecord<DrelUserPayload>(Data(carried))), carried);
    }
  });
}

}  // namespace
}  // namespace ironmoat
