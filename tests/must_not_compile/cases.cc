// One small record, of which each case replaces a part or to which it adds one.

#include <string_view>
#include <utility>

#include "host/server.h"
#include "ironmoat/command_response.h"
#include "records/keyed_record_impl.h"
#include "unpackers/conversion.h"

#ifndef SECOND
#define SECOND Optional<Int>
#endif
#ifndef ROWS
#define ROWS row<&R::first>("a"), row<&R::second>("b")
#endif
#ifndef ARGUMENTS
#define ARGUMENTS Optional<Int> first, second
#define FIELDS &R::first, &R::second
#endif
#ifndef REGISTERED
#define REGISTERED Output
#endif
#ifndef MORE_MEMBERS
#define MORE_MEMBERS
#endif
#ifndef MORE_CODE
#define MORE_CODE
#endif

namespace ironmoat {

struct Example {
  using CodingKeys = records::CodingKeys<Example>;

  Int command = 0;
  Optional<Int> first;
  SECOND second;
  MORE_MEMBERS

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<Example> {
  using R = Example;
  static constexpr KeyTable rows{row<&R::command>("c"), ROWS};
};
static_assert(records::wellFormed<Example>());

struct OutputArguments {
  Int command = 0;
  ARGUMENTS;

  using R = OutputArguments;
  using Fields = FieldList<R, &R::command, FIELDS>;
};

struct Output : OutputArguments {
  using Arguments = OutputArguments;
  static constexpr std::string_view schemaName = "Output";
  static Output with(Arguments arguments);
};

Output convert(Example&& wire) { return Output::with(argumentsFrom<Output>(std::move(wire))); }

struct Unpacker {
  using MessageSchemaType = Output;
  [[nodiscard]] Output unpack(const Data& message) const;
};
void registerAll(IronmoatServer& server) { server.registerUnpacker<REGISTERED>(Unpacker()); }

MORE_CODE

}  // namespace ironmoat
