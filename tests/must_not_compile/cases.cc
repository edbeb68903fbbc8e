// One small record: valid without a CASE_, and invalid in one way with each.

#include <string_view>
#include <utility>

#include "host/server.h"
#include "ironmoat/command_response.h"
#include "records/keyed_record_impl.h"
#include "unpackers/conversion.h"

namespace ironmoat {

struct Example {
  using CodingKeys = records::CodingKeys<Example>;

  Int command = 0;
  Optional<Int> first;
#ifdef CASE_unsupported_type
  Optional<float> second;
#elif defined(CASE_required_text)
  String second;
#else
  Optional<Int> second;
#endif
#ifdef CASE_missing_row
  Optional<Int> third;
#endif

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<Example> {
  using R = Example;
  static constexpr KeyTable rows{
      row<&R::command>("c"),
#ifdef CASE_swapped_rows
      row<&R::second>("b"),
      row<&R::first>("a"),
#elif defined(CASE_duplicate_key)
      row<&R::first>("a"),
      row<&R::second>("a"),
#else
      row<&R::first>("a"),
      row<&R::second>("b"),
#endif
#ifdef CASE_surplus_row
      row<&R::second>("d"),
#endif
  };
};
static_assert(records::wellFormed<Example>());

struct OutputArguments {
  Int command = 0;
#ifdef CASE_argument_of_another_type
  Optional<Int64> first;
#else
  Optional<Int> first;
#endif
#ifdef CASE_argument_without_field
  Optional<Int> other;
#else
  Optional<Int> second;
#endif

  using R = OutputArguments;
#ifdef CASE_argument_without_field
  using Fields = FieldList<R, &R::command, &R::first, &R::other>;
#elif defined(CASE_field_without_argument)
  using Fields = FieldList<R, &R::command, &R::first>;
#else
  using Fields = FieldList<R, &R::command, &R::first, &R::second>;
#endif
};

struct Output : OutputArguments {
  using Arguments = OutputArguments;
  static constexpr std::string_view schemaName = "Output";
  static Output with(Arguments arguments);
};

#ifdef CASE_overlooked_refusal
void decode(Example& wire, const plist::Decoder& decoder) { wire.decode(decoder); }
#endif

Output convert(Example&& wire) { return Output::with(argumentsFrom<Output>(std::move(wire))); }

struct Unpacker {
  using MessageSchemaType = Output;
  [[nodiscard]] Output unpack(const Data& message) const;
};

void registerAll(IronmoatServer& server) {
#ifdef CASE_mismatched_registration
  server.registerUnpacker<VeskCommandResponse>(Unpacker());
#else
  server.registerUnpacker<Output>(Unpacker());
#endif
}

}  // namespace ironmoat
