#include "records/message_payload.h"

#include "records/keyed_record_impl.h"

namespace ironmoat {

IRONMOAT_KEYED_RECORD(VeskCorvelProtocolPayload);

}  // namespace ironmoat
