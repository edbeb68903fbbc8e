// The deepest message that is accepted, through every stage, on a stack of one megabyte. (S8)

#include <gtest/gtest.h>
#include <pthread.h>

#include <functional>
#include <string>

#include "frames/record_codec.h"
#include "ironmoat/limits.h"
#include "plist/reader.h"
#include "plist/writer.h"
#include "unpackers/corvel_payload_unpacker.h"

namespace ironmoat {
namespace {

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

/// Payloads within payloads, `levels` of them, each an element of the one before.
std::string nested(std::size_t levels) {
  std::string start;
  std::string end;
  for (std::size_t level = 1; level <= levels; ++level) {
    start += "<dict><key>c</key><integer>" + std::to_string(level) + "</integer>";
    if (level < levels) start += level % 2 == 0 ? "<key>mml</key><array>" : "<key>dtl</key><array>";
    end += level > 1 ? "</array></dict>" : "</dict>";
  }
  return "<plist>" + start + end + "</plist>";
}

std::string reply(const DrelUserPayload& record) {
  BlockBuilder out;
  frames::encodeRecord(record, out);
  return {out.bytes(), out.size()};
}

TEST(NestingTest, TheDeepestPayloadFitsInAMegabyteOfStack) {
  onSmallStack([] {
    const Data xml(nested(limits::nestedContainers / 2));  // a list and a dictionary each
    plist::Document document;
    ASSERT_FALSE(plist::readXml(xml, document));
    for (const Data& message : {xml, writeBinary(document)}) {
      const std::string carried = reply(VeskCorvelPayloadUnpacker().unpack(message));
      EXPECT_EQ(reply(frames::decodeRecord<DrelUserPayload>(Data(carried))), carried);
    }
  });
}

}  // namespace
}  // namespace ironmoat
