// write_wire_tables FILE: prints the keys of all records for inspect/wire_tables.h, which is built
// where no record's table can be reached.

#include <cstddef>
#include <fstream>
#include <iomanip>
#include <iostream>
#include <string_view>
#include <type_traits>

#include "records/all_records.h"

namespace ironmoat {
namespace {

/// An argument's key is that of the wire field of its name.
template <class Output, class Wire>
void write(std::ostream& out) {
  constexpr std::string_view name = records::className<Output>();
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

void writeAll(std::ostream& out) {
  records::forEachRecord([&]<class Output, class Wire> { write<Output, Wire>(out); });
}

}  // namespace
}  // namespace ironmoat

int main(int count, char** arguments) {
  if (count != 2) return 2;
  std::ofstream out(arguments[1]);
  ironmoat::writeAll(out);
  return out.flush() ? 0 : 1;
}
