// All nine records by their tables, and the output records by their lists.

#include <gtest/gtest.h>

#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "plist/encoder.h"
#include "plist/property_list_decoder.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/payload_parts.h"
#include "records/web_tunnel.h"
#include "support/generated_records.h"

namespace ironmoat {

template <class R>
requires requires { typename R::CodingKeys; }
struct testing::FieldsOf<R> {
  using List = typename std::remove_const_t<decltype(records::Table<R>::rows)>::template Fields<R>;
};

namespace {

using testing::RecordGenerator;

/// One of g++'s compile-time checks, for compilers that cannot do it: members, whose addresses
/// ascend, stand in the list in their order.
template <class R, auto... Members>
void expectInOrder(FieldList<R, Members...>) {
  const R record{};
  const void* last = nullptr;
  const auto follows = [&](const void* member) {
    return std::less<>()(std::exchange(last, member), member);
  };
  EXPECT_TRUE((follows(&(record.*Members)) && ...)) << __PRETTY_FUNCTION__;
}

template <class R>
class RecordsTest : public ::testing::Test {};

using AllRecords = ::testing::Types<
    VeskCommandResponseSchema, VeskCommandWebTunnelResponseSchema, VeskCorvelProtocolPayload,
    VeskCorvelProtocolHttpHeaders, VeskCorvelProtocolDeliveryContext, VeskHoplinePluginRequest,
    VeskHoplineAllocationStatus, VeskHoplineSelfAllocToken, VeskHoplinePluginAllocation>;
TYPED_TEST_SUITE(RecordsTest, AllRecords);

TYPED_TEST(RecordsTest, DecodingWhatWasEncodedGivesTheSameRecord) {
  expectInOrder(typename testing::FieldsOf<TypeParam>::List());
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

TEST(OutputRecordsTest, ListTheirMembersInOrder) {
  expectInOrder(VeskCommandResponseArguments::Fields());
  expectInOrder(VeskCommandWebTunnelResponseArguments::Fields());
  expectInOrder(DrelUserPayloadArguments::Fields());
  expectInOrder(DrelUserPayloadHttpHeadersArguments::Fields());
  expectInOrder(DrelUserPayloadDeliveryContextArguments::Fields());
  expectInOrder(DrelHoplinePluginRequestArguments::Fields());
  expectInOrder(DrelHoplineAllocationStatusArguments::Fields());
  expectInOrder(DrelHoplineSelfAllocTokenArguments::Fields());
  expectInOrder(DrelHoplinePluginAllocationArguments::Fields());
}

}  // namespace
}  // namespace ironmoat
