#include "wire_keys.h"

#include <concepts>
#include <type_traits>
#include <vector>

#include "records/all_records.h"

namespace ironmoat::fuzz {

namespace {

template <class T>
struct HoldsOf {
  static constexpr Holds value = std::same_as<T, Bool>     ? Holds::boolean
                                 : std::same_as<T, String> ? Holds::text
                                 : std::same_as<T, Data>   ? Holds::data
                                 : std::integral<T>        ? Holds::integer
                                                           : Holds::record;
};
template <class T>
struct HoldsOf<List<T>> {
  static constexpr Holds value = std::same_as<T, String> ? Holds::texts : Holds::records;
};
template <class T>
struct HoldsOf<Optional<T>> : HoldsOf<T> {};

template <class R>
void addKeysOf(std::vector<WireKey>& keys) {
  constexpr const auto& rows = records::Table<R>::rows;
  std::size_t place = 0;
  std::remove_cvref_t<decltype(rows)>::template Fields<R>::forEach([&](auto field) {
    keys.push_back({rows.keys[place++], HoldsOf<typename decltype(field)::Type>::value});
  });
}

}  // namespace

std::span<const WireKey> wireKeys() {
  static const std::vector<WireKey> keys = [] {
    std::vector<WireKey> all;
    records::forEachRecord([&]<class Output, class Wire> { addKeysOf<Wire>(all); });
    return all;
  }();
  return keys;
}

}  // namespace ironmoat::fuzz
