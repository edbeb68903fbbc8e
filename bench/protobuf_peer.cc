#include "protobuf_peer.h"

#include <google/protobuf/arena.h>
#include <google/protobuf/message.h>
#include <google/protobuf/parse_context.h>

#include <cstddef>
#include <memory>
#include <stdexcept>
#include <type_traits>

#include "records.pb.h"

namespace ironmoat::bench {

namespace {

using google::protobuf::Arena;
using google::protobuf::FieldDescriptor;
using google::protobuf::Message;
using google::protobuf::Reflection;

/// Copies a record into a message. Field number N is the Nth field of the record's table.
class Copier {
 public:
  template <class R>
  static void copy(const R& record, Message& into) {
    using Fields =
        typename std::remove_const_t<decltype(records::Table<R>::rows)>::template Fields<R>;
    int place = 0;
    Fields::forEach([&](auto field) {
      const FieldDescriptor* to = into.GetDescriptor()->FindFieldByNumber(++place);
      if (to == nullptr || to->name() != field.name) throw std::logic_error("another schema");
      put(field.in(record), into, to);
    });
  }

 private:
  template <class Optional>
  requires requires(Optional field) { field.has_value(); }
  static void put(const Optional& value, Message& into, const FieldDescriptor* to) {
    if (value) put(*value, into, to);
  }
  template <class T>
  requires std::is_same_v<T, Int> || std::is_same_v<T, Int64>
  static void put(T value, Message& into, const FieldDescriptor* to) {
    into.GetReflection()->SetInt64(&into, to, value);
  }
  static void put(Bool value, Message& into, const FieldDescriptor* to) {
    into.GetReflection()->SetBool(&into, to, value);
  }
  template <class T>
  requires std::is_same_v<T, String> || std::is_same_v<T, Data>
  static void put(const T& value, Message& into, const FieldDescriptor* to) {
    into.GetReflection()->SetString(&into, to, std::string(value.view()));
  }
  static void put(const List<String>& list, Message& into, const FieldDescriptor* to) {
    for (const String& text : list) {
      into.GetReflection()->AddString(&into, to, std::string(text.view()));
    }
  }
  template <class R>
  static void put(const List<R>& list, Message& into, const FieldDescriptor* to) {
    for (const R& record : list) copy(record, *into.GetReflection()->AddMessage(&into, to));
  }
  template <class R>
  requires requires { typename R::CodingKeys; }
  static void put(const R& record, Message& into, const FieldDescriptor* to) {
    copy(record, *into.GetReflection()->MutableMessage(&into, to));
  }
};

using Payload = peer::VeskCorvelProtocolPayload;

long long parseInto(Payload& message, const std::string& bytes) {
  // As ParseFromArray, which rejects messages nested deeper than 100.
  constexpr int kDeepest = 1000;
  const char* at = nullptr;
  google::protobuf::internal::ParseContext context(kDeepest, false, &at, bytes);
  at = message._InternalParse(at, &context);
  if (at == nullptr || !context.EndedAtLimit()) {
    throw std::runtime_error("protobuf refuses its own bytes");
  }
  return message.command();
}

}  // namespace

std::string protobufOf(const VeskCorvelProtocolPayload& record, std::size_t unknown) {
  constexpr int kFirstUnknown = 1000;
  Payload message;
  Copier::copy(record, message);
  auto* const others = message.GetReflection()->MutableUnknownFields(&message);
  for (std::size_t i = 0; i < unknown; ++i) {
    others->AddVarint(kFirstUnknown + static_cast<int>(i), i);
  }
  return message.SerializeAsString();
}

long long parseProtobuf(const std::string& bytes) {
  Payload message;
  return parseInto(message, bytes);
}

long long parseProtobufInArena(const std::string& bytes) {
  Arena arena;
  return parseInto(*Arena::CreateMessage<Payload>(&arena), bytes);
}

long long parseProtobufInWarmArena(const std::string& bytes) {
  constexpr std::size_t kFirstBlock = std::size_t{64} << 10;
  static const auto block = std::make_unique<char[]>(kFirstBlock);
  google::protobuf::ArenaOptions options;
  options.initial_block = block.get();
  options.initial_block_size = kFirstBlock;
  Arena arena(options);
  return parseInto(*Arena::CreateMessage<Payload>(&arena), bytes);
}

}  // namespace ironmoat::bench
