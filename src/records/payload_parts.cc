#include "records/payload_parts.h"

#include "records/keyed_record_impl.h"

namespace ironmoat {

IRONMOAT_KEYED_RECORD(VeskCorvelProtocolDeliveryContext);
IRONMOAT_KEYED_RECORD(VeskHoplinePluginRequest);
IRONMOAT_KEYED_RECORD(VeskHoplineAllocationStatus);
IRONMOAT_KEYED_RECORD(VeskHoplineSelfAllocToken);
IRONMOAT_KEYED_RECORD(VeskHoplinePluginAllocation);

}  // namespace ironmoat
