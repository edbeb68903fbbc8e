#include "records/command_response.h"

#include "records/keyed_record_impl.h"

namespace ironmoat {

IRONMOAT_KEYED_RECORD(VeskCommandResponseSchema);

}  // namespace ironmoat
