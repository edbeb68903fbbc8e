// write_wire_tables FILE: prints the keys of all records for inspect/wire_tables.h, which is built
// where no record's table can be reached.

#include <cstddef>
#include <fstream>
#include <iomanip>
#include <iostream>
#include <string_view>
#include <type_traits>

#include "ironmoat/command_response.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/payload_parts.h"
#include "records/web_tunnel.h"

namespace ironmoat {
namespace {

/// An argument's key is that of the wire field of its name.
template <class Output, class Wire>
void write(std::ostream& out, std::string_view name) {
  constexpr const auto& rows = records::Table<Wire>::rows;
  using Fields = typename std::remove_cvref_t<decltype(rows)>::template Fields<Wire>;
  using Arguments = typename Output::Arguments::Fields;
  static_assert(Fields::count == Arguments::count);
  out << "template <>\nstruct WireTable<" << name
      << "> {\n  static constexpr std::string_view name = " << std::quoted(name)
      << ";\n  static constexpr std::array<std::string_view, " << Arguments::count
      << "> keys = {\n";
  for (const std::string_view argument : Arguments::names) {
    std::size_t place = 0;
    while (Fields::names.at(place) != argument) ++place;
    out << "      " << std::quoted(rows.keys[place]) << ",\n";
  }
  out << "  };\n};\n";
}

#define WRITE(Output, Wire) write<Output, Wire>(out, #Output)

void writeAll(std::ostream& out) {
  WRITE(VeskCommandResponse, VeskCommandResponseSchema);
  WRITE(VeskCommandWebTunnelResponse, VeskCommandWebTunnelResponseSchema);
  WRITE(DrelUserPayload, VeskCorvelProtocolPayload);
  WRITE(DrelUserPayloadHttpHeaders, VeskCorvelProtocolHttpHeaders);
  WRITE(DrelUserPayloadDeliveryContext, VeskCorvelProtocolDeliveryContext);
  WRITE(DrelHoplinePluginRequest, VeskHoplinePluginRequest);
  WRITE(DrelHoplineAllocationStatus, VeskHoplineAllocationStatus);
  WRITE(DrelHoplineSelfAllocToken, VeskHoplineSelfAllocToken);
  WRITE(DrelHoplinePluginAllocation, VeskHoplinePluginAllocation);
}

}  // namespace
}  // namespace ironmoat

int main(int count, char** arguments) {
  if (count != 2) return 2;
  std::ofstream out(arguments[1]);
  ironmoat::writeAll(out);
  return out.flush() ? 0 : 1;
}
