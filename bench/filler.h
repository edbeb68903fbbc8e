#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>

#include "ironmoat/values.h"
#include "messages.h"
#include "records/keyed_record.h"

namespace ironmoat::bench {

/// Sets the fields of records, each to a value that no other field has.
class Filler {
 public:
  explicit Filler(std::uint64_t number = 0) : number_(number) {}
  virtual ~Filler() = default;

  /// Sets the required fields, and those for which `wanted(place in the table)` is true.
  template <class R, class Wanted>
  void fill(R& record, Wanted wanted) {
    using Fields =
        typename std::remove_const_t<decltype(records::Table<R>::rows)>::template Fields<R>;
    std::size_t place = 0;
    Fields::forEach([&](auto field) {
      const bool chosen = wanted(place++);
      if (chosen || records::detail::isRequired<typename decltype(field)::Type>) {
        value(field.in(record));
      }
    });
  }
  template <class R>
  void fill(R& record) {
    fill(record, [](std::size_t) { return true; });
  }

 protected:
  virtual std::size_t length(std::size_t usual) { return usual; }
  virtual std::int64_t integer(std::int64_t usual) { return usual; }

 private:
  template <class Optional>
  requires requires(Optional field) { field.has_value(); }
  void value(Optional& field) {
    typename Optional::value_type inner{};
    value(inner);
    field = std::move(inner);
  }
  void value(Int& field) { field = integer(static_cast<Int>(1000 * ++number_)); }
  void value(Int64& field) { field = integer(static_cast<Int64>(1732309874123456789 + ++number_)); }
  void value(Bool& field) { field = (++number_ & 1) != 0; }
  void value(String& field) { field = String(hex(length(39), ++number_)); }
  void value(Data& field) { field = Data(noise(length(32), ++number_)); }
  template <class T>
  void value(List<T>& field) {
    for (int i = 0; i < 3; ++i) value(field.emplace_back());
  }
  void value(List<VeskCorvelProtocolPayload>& field) {
    field.push_back(typicalPayload(static_cast<unsigned>(++number_)));
  }
  template <class R>
  requires requires { typename R::CodingKeys; }
  void value(R& field) { fill(field); }

  std::uint64_t number_;
};

}  // namespace ironmoat::bench
