// Prints the tables of all records as JSON, for tests and documents that must not have a second
// copy of them: the fields of the wire records in decoding order, the arguments of the output
// records' initialisers in label order, and the limits that a message meets.

#include <array>
#include <concepts>
#include <cstdlib>
#include <iomanip>
#include <iostream>
#include <string>
#include <string_view>
#include <type_traits>

#include "ironmoat/command_response.h"
#include "ironmoat/limits.h"
#include "ironmoat/user_payload.h"
#include "ironmoat/web_tunnel_response.h"
#include "records/command_response.h"
#include "records/message_payload.h"
#include "records/payload_parts.h"
#include "records/web_tunnel.h"

namespace ironmoat {
namespace {

template <class Named>
constexpr std::string_view className() {
  const std::string_view pretty = __PRETTY_FUNCTION__;  // ...Named = Scope::Class] or ...; ...]
  const std::size_t end = pretty.find_first_of(";]", pretty.find("Named = "));
  const std::size_t start = pretty.find_last_of(": ", end - 1) + 1;
  return pretty.substr(start, end - start);
}

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

/// The members of an array or object, each on a line of its own.
class Lines {
 public:
  explicit Lines(int indent) : indent_(indent) {}
  std::ostream& next() {
    if (!first_) std::cout << ',';
    first_ = false;
    return std::cout << '\n' << std::string(static_cast<std::size_t>(indent_), ' ');
  }

 private:
  int indent_;
  bool first_ = true;
};

template <class T>
void printType() {
  std::cout << "\"type\": " << std::quoted(TypeOf<T>::name())
            << ", \"optional\": " << (TypeOf<T>::optional ? "true" : "false");
}

template <class R>
void printWireRecord(Lines& records) {
  constexpr const auto& rows = records::Table<R>::rows;
  records.next() << "{\"name\": " << std::quoted(className<R>()) << ", \"bytes\": " << sizeof(R)
                 << ", \"fields\": [";
  Lines lines(6);
  std::size_t place = 0;
  std::remove_cvref_t<decltype(rows)>::template Fields<R>::forEach([&](auto field) {
    using F = decltype(field);
    lines.next() << "{\"name\": " << std::quoted(F::name) << ", ";
    printType<typename F::Type>();
    std::cout << ", \"key\": " << std::quoted(rows.keys[place++]) << '}';
  });
  std::cout << "]}";
}

/// The label of an initialiser's argument: the first is labelled `with`, every other one has its
/// field's name.
std::string_view argumentLabel(std::size_t position, std::string_view fieldName) {
  return position == 0 ? "with" : fieldName;
}

template <class R>
void printOutputRecord(Lines& records) {
  records.next() << "{\"name\": " << std::quoted(className<R>()) << ", \"arguments\": [";
  Lines lines(6);
  std::size_t place = 0;
  R::Arguments::Fields::forEach([&](auto field) {
    using F = decltype(field);
    lines.next() << "{\"label\": " << std::quoted(argumentLabel(place++, F::name)) << ", ";
    printType<typename F::Type>();
    std::cout << '}';
  });
  std::cout << "]}";
}

template <class... R>
void printWireRecords() {
  Lines records(4);
  (printWireRecord<R>(records), ...);
}

template <class... R>
void printOutputRecords() {
  Lines records(4);
  (printOutputRecord<R>(records), ...);
}

void printTables() {
  std::cout << "{\n  \"limits\": {\"messageBytes\": " << limits::messageBytes
            << ", \"nestedContainers\": " << limits::nestedContainers
            << ", \"recordBytes\": " << limits::recordBytes
            << ", \"deliveredBytes\": " << limits::deliveredBytes << "},\n  \"wireRecords\": [";
  printWireRecords<
      VeskCommandResponseSchema, VeskCommandWebTunnelResponseSchema, VeskCorvelProtocolPayload,
      VeskCorvelProtocolHttpHeaders, VeskCorvelProtocolDeliveryContext, VeskHoplinePluginRequest,
      VeskHoplineAllocationStatus, VeskHoplineSelfAllocToken, VeskHoplinePluginAllocation>();
  std::cout << "],\n  \"outputRecords\": [";
  printOutputRecords<VeskCommandResponse, VeskCommandWebTunnelResponse, DrelUserPayload,
                     DrelUserPayloadHttpHeaders, DrelUserPayloadDeliveryContext,
                     DrelHoplinePluginRequest, DrelHoplineAllocationStatus,
                     DrelHoplineSelfAllocToken, DrelHoplinePluginAllocation>();
  std::cout << "]\n}\n";
}

}  // namespace
}  // namespace ironmoat

int main() {
  ironmoat::printTables();
  return std::cout.flush() ? EXIT_SUCCESS : EXIT_FAILURE;
}
