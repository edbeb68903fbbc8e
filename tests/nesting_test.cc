// The deepest message that is accepted, through every stage, on a stack of one megabyte. (S8)

#include <gtest/gtest.h>
#include <pthread.h>

#include <functional>

#include "frames/record_codec.h"
#include "ironmoat/limits.h"
#include "plist/encoder.h"
#include "plist/property_list_decoder.h"
#include "records/message_payload.h"
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
VeskCorvelProtocolPayload nested(std::size_t levels) {
  VeskCorvelProtocolPayload payload;
  payload.command = static_cast<Int>(levels);
  for (std::size_t level = levels - 1; level > 0; --level) {
    VeskCorvelProtocolPayload outer;
    outer.command = static_cast<Int>(level);
    auto& list = level % 2 == 0 ? outer.corvelMessageList : outer.dstIdTokenList;
    list = List<VeskCorvelProtocolPayload>();
    list->push_back(std::move(payload));
    payload = std::move(outer);
  }
  return payload;
}

constexpr std::size_t kLevels = limits::nestedContainers / 2;  // a list and a dictionary each

TEST(NestingTest, TheDeepestPayloadFitsInAMegabyteOfStack) {
  onSmallStack([] {
    for (const plist::Form form : {plist::Form::binary, plist::Form::xml}) {
      const Data message = plist::PropertyListEncoder(form).encode(nested(kLevels));
      const DrelUserPayload output = VeskCorvelPayloadUnpacker().unpack(message);
      BlockBuilder reply;
      frames::encodeRecord(output, reply);
      const BlockRef block = reply.finish();
      const Data body(detail::Slice(block.get(), 0, block->size()));
      const auto again = frames::decodeRecord<DrelUserPayload>(body);
      std::size_t depth = 1;
      const DrelUserPayload* at = &again;
      while (true) {
        const auto& list = at->dstIdTokenList.empty() ? at->corvelMessageList : at->dstIdTokenList;
        if (list.empty()) break;
        at = &list[0];
        ++depth;
      }
      EXPECT_EQ(depth, kLevels);
      EXPECT_EQ(at->command, static_cast<Int>(kLevels));
    }
  });
}

}  // namespace
}  // namespace ironmoat
