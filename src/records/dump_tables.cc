// Prints the tables of all records as JSON, for tests and documents that must not have a second
// copy of them: the fields of the wire records in decoding order, the arguments of the output
// records' initialisers in label order, the frames' version, and the limits that a message meets.

#include <concepts>
#include <cstdlib>
#include <iomanip>
#include <iostream>
#include <sstream>
#include <string>
#include <string_view>
#include <type_traits>

#include "frames/frame.h"
#include "ironmoat/limits.h"
#include "records/all_records.h"

namespace ironmoat {
namespace {

using records::className;

template <class T>
struct TypeOf {
  static constexpr bool optional = false;
  static std::string name() {
    if constexpr (std::same_as<T, Int>) return "Int";
    if constexpr (std::same_as<T, Int64>) return "Int64";
    if constexpr (std::same_as<T, Bool>) return "Bool";
    return std::string(className<T>());
  }
};
template <class T>
struct TypeOf<List<T>> {
  static constexpr bool optional = false;
  static std::string name() { return "list of " + TypeOf<T>::name(); }
};
template <class T>
struct TypeOf<Optional<T>> {
  static constexpr bool optional = true;
  static std::string name() { return TypeOf<T>::name(); }
};

/// The fields, each with what `more` prints of its name and place.
template <class Fields, class More>
std::string fields(More more) {
  std::ostringstream out;
  std::size_t place = 0;
  Fields::forEach([&](auto field) {
    using F = decltype(field);
    using Type = TypeOf<typename F::Type>;
    out << (place == 0 ? "\n" : ",\n") << "{\"type\": " << std::quoted(Type::name())
        << ", \"optional\": " << (Type::optional ? "true" : "false");
    more(out, F::name, place++);
    out << '}';
  });
  return out.str();
}

template <class R>
std::string wireRecord() {
  constexpr const auto& rows = records::Table<R>::rows;
  std::ostringstream out;
  out << "{\"name\": " << std::quoted(className<R>()) << ", \"bytes\": " << sizeof(R)
      << ", \"fields\": [";
  using Fields = typename std::remove_cvref_t<decltype(rows)>::template Fields<R>;
  out << fields<Fields>([](std::ostream& to, std::string_view name, std::size_t place) {
    to << ", \"name\": " << std::quoted(name) << ", \"key\": " << std::quoted(rows.keys[place]);
  });
  return out.str() + "]}";
}

/// The first argument is labelled `with`, every other one has its field's name.
template <class R>
std::string outputRecord() {
  std::ostringstream out;
  out << "{\"name\": " << std::quoted(className<R>()) << ", \"arguments\": [";
  out << fields<typename R::Arguments::Fields>(
      [](std::ostream& to, std::string_view name, std::size_t place) {
        to << ", \"label\": " << std::quoted(place == 0 ? "with" : name);
      });
  return out.str() + "]}";
}

void printTables() {
  std::string wireRecords;
  std::string outputRecords;
  records::forEachRecord([&]<class Output, class Wire> {
    const char* const separator = wireRecords.empty() ? "" : ",\n";
    wireRecords.append(separator).append(wireRecord<Wire>());
    outputRecords.append(separator).append(outputRecord<Output>());
  });
  std::cout << "{\"version\": " << frames::kVersion
            << ",\n\"limits\": {\"messageBytes\": " << limits::messageBytes
            << ", \"nestedContainers\": " << limits::nestedContainers
            << ", \"recordBytes\": " << limits::recordBytes
            << ", \"deliveredBytes\": " << limits::deliveredBytes << "},\n\"wireRecords\": ["
            << wireRecords << "],\n\"outputRecords\": [" << outputRecords << "]}\n";
}

}  // namespace
}  // namespace ironmoat

int main() {
  ironmoat::printTables();
  return std::cout.flush() ? EXIT_SUCCESS : EXIT_FAILURE;
}
