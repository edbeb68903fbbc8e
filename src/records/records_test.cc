// All nine records by their tables: what is encoded decodes to the same, in both forms.

#include <gtest/gtest.h>

#include "plist/encoder.h"
#include "plist/property_list_decoder.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/payload_parts.h"
#include "records/web_tunnel.h"
#include "support/generated_records.h"

namespace ironmoat {
namespace {

using testing::RecordGenerator;

template <class R>
class RecordsTest : public ::testing::Test {};

using AllRecords = ::testing::Types<
    VeskCommandResponseSchema, VeskCommandWebTunnelResponseSchema, VeskCorvelProtocolPayload,
    VeskCorvelProtocolHttpHeaders, VeskCorvelProtocolDeliveryContext, VeskHoplinePluginRequest,
    VeskHoplineAllocationStatus, VeskHoplineSelfAllocToken, VeskHoplinePluginAllocation>;
TYPED_TEST_SUITE(RecordsTest, AllRecords);

TYPED_TEST(RecordsTest, DecodingWhatWasEncodedGivesTheSameRecord) {
  const auto roundTrip = [](const TypeParam& record) {
    for (const plist::Form form : {plist::Form::binary, plist::Form::xml}) {
      const Data message = plist::PropertyListEncoder(form).encode(record);
      const auto again = plist::PropertyListDecoder().decode<TypeParam>(message);
      ASSERT_EQ(testing::difference(record, again), "");
    }
  };
  roundTrip(RecordGenerator(1, 0).make<TypeParam>(3));
  roundTrip(RecordGenerator(2, 1).make<TypeParam>(1));
  for (std::uint64_t seed = 3; seed < 60; ++seed) {
    roundTrip(RecordGenerator(seed, seed % 2 == 0 ? 0.1 : 0.5).make<TypeParam>(2));
    if (this->HasFatalFailure()) FAIL() << "seed " << seed;
  }
}

}  // namespace
}  // namespace ironmoat
