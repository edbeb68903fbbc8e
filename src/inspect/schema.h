#pragma once

#include <concepts>
#include <cstddef>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "inspect/options.h"
#include "inspect/present_fields.h"
#include "inspect/text_view.h"
#include "inspect/wire_tables.h"
#include "ironmoat/values.h"

namespace ironmoat::inspect {

struct FieldSchema {
  std::string_view key;   ///< in messages, and in the paths of errors
  std::string_view name;  ///< in the record, and in what this tool shows
  std::string_view type;  ///< Int, Int64, Bool, String, Data, or a record's name
  bool list;
  bool required;  ///< no message is accepted without it
};

struct RecordSchema {
  std::string_view name;
  std::vector<FieldSchema> fields;
};

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

/// Appends the record `R` and those in it, each once.
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

void showSchemas(std::span<const RecordSchema> records, Format format, const Colours& colours,
                 std::string& out);

/// Appends one line of JSON, or lines of text.
template <Record R>
void showSchemaOf(Format format, const Colours& colours, std::string& out) {
  std::vector<RecordSchema> records;
  collectSchemas<R>(records);
  showSchemas(records, format, colours, out);
}

}  // namespace ironmoat::inspect
