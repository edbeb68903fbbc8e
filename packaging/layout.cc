// Prints the memory layout that daemons share with the client library: a line for each type, and
// for each field of a record. packaging/check-layout compares it with the layout recorded for the
// soname.

#include <cstddef>
#include <cstdlib>
#include <iostream>
#include <string_view>

#include "ironmoat/client.h"
#include "records/all_records.h"

namespace ironmoat {
namespace {

template <class T>
void print(std::string_view name = records::className<T>()) {
  std::cout << name << ": " << sizeof(T) << " bytes, aligned to " << alignof(T) << '\n';
}

template <class R>
void printRecord() {
  print<R>();
  const typename R::Arguments record{};
  R::Arguments::Fields::forEach([&](auto field) {
    using F = decltype(field);
    if constexpr (F::sparse) {
      std::cout << "  value " << F::Stored::index << ' ' << F::name << '\n';
      return;
    }
    const auto* const start = reinterpret_cast<const std::byte*>(&record);
    const auto* const at = reinterpret_cast<const std::byte*>(&F::in(record));
    std::cout << "  " << at - start << ' ' << F::name << ": " << sizeof(typename F::Type) << '\n';
  });
}

}  // namespace
}  // namespace ironmoat

int main() {
  using namespace ironmoat;
  print<Client>();
  print<Client::Options>("Client::Options");
  print<DecodingError>();
  print<ServiceError>();
  print<Block>();
  print<Data>();
  print<String>();
  print<Pending<VeskCommandResponse>>("Pending");
  records::forEachRecord([]<class Output, class Wire> { printRecord<Output>(); });
  return std::cout.flush() ? EXIT_SUCCESS : EXIT_FAILURE;
}
