#include "inspect/record_types.h"

#include <algorithm>
#include <array>
#include <concepts>

#include "inspect/present_fields.h"
#include "inspect/wire_tables.h"

namespace ironmoat::inspect {

namespace {

template <class T>
struct Unwrapped {
  using Type = T;
  static constexpr bool list = false;
};
template <class T>
struct Unwrapped<Optional<T>> : Unwrapped<T> {};
template <class T>
struct Unwrapped<List<T>> : Unwrapped<T> {
  static constexpr bool list = true;
};

template <class T>
constexpr std::string_view typeName() {
  if constexpr (std::same_as<T, Int>) return "Int";
  if constexpr (std::same_as<T, Int64>) return "Int64";
  if constexpr (std::same_as<T, Bool>) return "Bool";
  if constexpr (std::same_as<T, String>) return "String";
  if constexpr (std::same_as<T, Data>) return "Data";
  if constexpr (Record<T>) return WireTable<T>::name;
}

/// Appends the schemas of the record `R` and of its nested records, each once.
template <Record R>
void collectSchemas(std::vector<RecordSchema>& records) {
  for (const RecordSchema& known : records) {
    if (known.name == typeName<R>()) return;
  }
  static_assert(WireTable<R>::keys.size() == R::Arguments::Fields::count);
  RecordSchema record{typeName<R>(), {}};
  R::Arguments::Fields::forEach([&](auto field) {
    using T = typename decltype(field)::Type;
    record.fields.push_back({WireTable<R>::keys[record.fields.size()], decltype(field)::name,
                             typeName<typename Unwrapped<T>::Type>(), Unwrapped<T>::list,
                             !kIsOptional<T> && !kIsList<T>});
  });
  records.push_back(std::move(record));
  R::Arguments::Fields::forEach([&](auto field) {
    using T = typename Unwrapped<typename decltype(field)::Type>::Type;
    if constexpr (Record<T>) collectSchemas<T>(records);
  });
}

/// The schemas of the record `R` and of its nested records.
template <Record R>
std::vector<RecordSchema> schemasOf() {
  std::vector<RecordSchema> records;
  collectSchemas<R>(records);
  return records;
}

template <MessageSchema R>
constexpr RecordType row(std::string_view name) {
  return {name,
          [](Client& client, const Data& message) -> Types::Pending {
            return client.submit<R>(message);
          },
          schemasOf<R>};
}

constexpr std::array kRecordTypes = {
    row<VeskCommandResponse>("command-response"),
    row<VeskCommandWebTunnelResponse>("web-tunnel-response"),
    row<DrelUserPayload>("payload"),
};

}  // namespace

std::span<const RecordType> recordTypes() noexcept { return kRecordTypes; }

const RecordType* recordType(std::string_view name) noexcept {
  const auto* found = std::find_if(kRecordTypes.begin(), kRecordTypes.end(),
                                   [name](const RecordType& type) { return type.name == name; });
  return found == kRecordTypes.end() ? nullptr : found;
}

}  // namespace ironmoat::inspect
