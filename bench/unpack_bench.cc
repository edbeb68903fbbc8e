// Time of unpacking each sample, and of what other parsers need for the same content, in one
// process and one run: scripts/bench runs it and makes the table.

#include <benchmark/benchmark.h>

#include <cstring>
#include <string>
#include <vector>

#include "confinement/memory.h"
#include "messages.h"
#include "plist/property_list_decoder.h"
#include "protobuf_peer.h"
#include "records/message_payload.h"
#include "unpackers/corvel_payload_unpacker.h"
#include "xml_peers.h"

namespace ironmoat::bench {
namespace {

template <class Function>
void add(std::string_view message, std::string_view what, Function once, std::size_t bytes) {
  const std::string name = std::string(message) + "/" + std::string(what);
  benchmark::RegisterBenchmark(name.c_str(), [once, bytes](benchmark::State& state) mutable {
    for (auto _ : state) benchmark::DoNotOptimize(once());
    state.counters["bytes"] = static_cast<double>(bytes);
  });
}

void addForm(const Sample& sample, plist::Form form) {
  const Data message = messageOf(sample.record, form);
  const std::string prefix = std::string(nameOf(form)) + "/";
  const std::size_t size = message.size();
  add(
      sample.name, prefix + "unpack",
      [message] { return VeskCorvelPayloadUnpacker().unpack(message).command; }, size);
  add(
      sample.name, prefix + "copy_and_unpack",
      [bytes = std::string(message.view())] {
        return VeskCorvelPayloadUnpacker().unpack(inOneThreadBlock(bytes)).command;
      },
      size);
  const auto addRefused = [&](const char* what, const Data& bad) {
    add(
        sample.name, prefix + what,
        [bad] {  // what depends on the message: throwing takes the same time for each
          VeskCorvelProtocolPayload wire;
          return plist::PropertyListDecoder().decode(bad, wire).value().kind();
        },
        bad.size());
  };
  addRefused("wrong", messageOf(WrongAtLast{sample.record}, form));
  addRefused("broken", brokenAtLast(message, form));
  add(
      sample.name, prefix + "memcpy",
      [bytes = std::string(message.view()), to = std::vector<char>(size)]() mutable {
        std::memcpy(to.data(), bytes.data(), bytes.size());
        benchmark::ClobberMemory();
        return to.data();
      },
      size);
  if (form != plist::Form::xml) return;
  const std::string text(message.view());
  add(
      sample.name, "expat", [text] { return expatEvents(text); }, size);
  add(
      sample.name, "pugixml", [text] { return pugixmlDom(text); }, size);
}

void addSample(const Sample& sample) {
  addForm(sample, plist::Form::binary);
  addForm(sample, plist::Form::xml);
  const std::string bytes = protobufOf(sample.record);
  add(
      sample.name, "protobuf", [bytes] { return parseProtobuf(bytes); }, bytes.size());
  add(
      sample.name, "protobuf_arena", [bytes] { return parseProtobufInArena(bytes); }, bytes.size());
  add(
      sample.name, "protobuf_warm_arena", [bytes] { return parseProtobufInWarmArena(bytes); },
      bytes.size());
}

}  // namespace
}  // namespace ironmoat::bench

int main(int argc, char** argv) {
  // For everyone alike: large blocks are kept, not given back to the kernel after each message.
  ironmoat::confinement::prepareMemory();
  for (const auto& sample : ironmoat::bench::samples()) ironmoat::bench::addSample(sample);
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
}
