// Measures unpacking each sample and each stream, and other parsers on the same content, in one
// process and one run. scripts/bench runs it and prints the tables.

#include <benchmark/benchmark.h>

#include <string>
#include <vector>

#include "messages.h"
#include "plist/property_list_decoder.h"
#include "protobuf_peer.h"
#include "records/message_payload.h"
#include "sandbox/memory.h"
#include "streams.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "xml_peers.h"

namespace ironmoat::bench {
namespace {

/// Calls `once(message)` for each of the messages in turn.
template <class Message, class Function>
void add(std::string_view name, std::string_view what, std::vector<Message> messages,
         Function once) {
  std::size_t bytes = 0;
  for (const Message& message : messages) bytes += message.size();
  const std::string full = std::string(name) + "/" + std::string(what);
  benchmark::RegisterBenchmark(full.c_str(), [=](benchmark::State& state) {
    std::size_t next = 0;
    for (auto _ : state) {
      benchmark::DoNotOptimize(once(messages[next]));
      if (++next == messages.size()) next = 0;
    }
    state.counters["bytes"] = static_cast<double>(bytes / messages.size());
  });
}

Int unpack(const Data& message) { return VeskCorvelPayloadUnpacker().unpack(message).command; }

void addForm(std::string_view name, const std::vector<Data>& messages, plist::Format form) {
  const std::string prefix = std::string(nameOf(form)) + "/";
  std::vector<std::string> texts;
  for (const Data& message : messages) texts.emplace_back(message.view());
  add(name, prefix + "unpack", messages, unpack);
  add(name, prefix + "copy_and_unpack", texts,
      [](const std::string& text) { return unpack(inOneThreadBlock(text)); });
  if (form != plist::Format::xml) return;
  add(name, "expat", texts, expatEvents);
  add(name, "pugixml", texts, pugixmlDom);
}

void addProtobuf(std::string_view name, const std::vector<std::string>& messages) {
  add(name, "protobuf", messages, parseProtobuf);
  add(name, "protobuf_arena", messages, parseProtobufInArena);
  add(name, "protobuf_warm_arena", messages, parseProtobufInWarmArena);
}

void addSample(const Sample& sample) {
  for (const plist::Format form : {plist::Format::binary, plist::Format::xml}) {
    const Data message = messageOf(sample.record, form);
    addForm(sample.name, {message}, form);
    const auto addRefused = [&](const char* what, const Data& bad) {
      add(sample.name, std::string(nameOf(form)) + what, std::vector{bad}, [](const Data& refused) {
        // Measures up to the error, which depends on the message; throwing it takes the same time
        // for each.
        VeskCorvelProtocolPayload wire;
        return plist::PropertyListDecoder().decode(refused, wire).value().kind();
      });
    };
    addRefused("/wrong", messageOf(WrongAtLast{sample.record}, form));
    addRefused("/broken", brokenAtLast(message, form));
  }
  addProtobuf(sample.name, {protobufOf(sample.record)});
}

void addStream(const Stream& stream) {
  for (const plist::Format form : {plist::Format::binary, plist::Format::xml}) {
    addForm(stream.name, messagesOf(stream, form), form);
  }
  std::vector<std::string> messages;
  for (const auto& record : stream.records) {
    messages.push_back(protobufOf(record, stream.unknownKeys));
  }
  addProtobuf(stream.name, messages);
}

}  // namespace
}  // namespace ironmoat::bench

int main(int argc, char** argv) {
  // For all parsers alike: malloc keeps large blocks instead of returning them after each message.
  ironmoat::sandbox::prepareMemory();
  constexpr std::size_t kStream = 2048;
  for (const auto& sample : ironmoat::bench::samples()) ironmoat::bench::addSample(sample);
  for (const auto& stream : ironmoat::bench::streams(kStream)) ironmoat::bench::addStream(stream);
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
}
