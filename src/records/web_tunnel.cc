#include "records/web_tunnel.h"

#include "records/keyed_record_impl.h"

namespace ironmoat {

IRONMOAT_KEYED_RECORD(VeskCorvelProtocolHttpHeaders);
IRONMOAT_KEYED_RECORD(VeskCommandWebTunnelResponseSchema);

}  // namespace ironmoat
