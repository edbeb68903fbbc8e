// growth SMALLEST LARGEST [time]: prints what unpacking costs, one JSON line for each format of
// each sample, of each message that is rejected at its end, of each stream, and of each shape in
// several sizes from SMALLEST to LARGEST bytes. A line has the number of messages; for one message
// its bytes, its allocations and, with `time`, for shapes, the least CPU nanoseconds of several
// runs; and the peak bytes of heap.
//
// `measured` unpacks each line's messages once, in the order of the lines, so that callgrind with
// --toggle-collect and --dump-after on it counts instructions in the same order.

#include <time.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <span>
#include <string_view>

#include "heap_count.h"
#include "messages.h"
#include "sandbox/memory.h"
#include "shapes.h"
#include "streams.h"
#include "unpackers/corvel_payload_unpacker.h"

static void unpackOnce(const ironmoat::Data& message) {
  try {
    const auto record = ironmoat::VeskCorvelPayloadUnpacker().unpack(message);
    asm volatile("" : : "r"(&record) : "memory");
  } catch (const ironmoat::DecodingError&) {
  }
}

extern "C" [[gnu::noinline]] void measured(std::span<const ironmoat::Data> messages) {
  for (const ironmoat::Data& message : messages) unpackOnce(message);
}

namespace ironmoat::bench {
namespace {

double cpuNanoseconds() {
  timespec now{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return 1e9 * static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec);
}

/// The least CPU nanoseconds of one unpacking, measured in batches that are long enough for the
/// clock.
double leastTime(const Data& message) {
  constexpr double kBatch = 1e5;
  constexpr double kEnough = 5e7;
  double least = 1e18;
  double spent = 0;
  std::size_t batch = 1;
  for (int run = 0; run < 25 || spent < kEnough; ++run) {
    const double start = cpuNanoseconds();
    for (std::size_t i = 0; i < batch; ++i) {
      unpackOnce(message);
    }
    const double time = cpuNanoseconds() - start;
    spent += time;
    least = std::min(least, time / static_cast<double>(batch));
    if (time < kBatch) batch *= 2;
  }
  return least;
}

void report(std::string_view kind, std::string_view name, plist::Format form,
            std::span<const Data> messages, bool timed) {
  // Warms up: initialisation that happens once, caches and branch predictor.
  for (int i = 0; i < 3; ++i) unpackOnce(messages[0]);
  std::size_t bytes = 0;
  for (const Data& message : messages) bytes += message.size();
  const HeapCount before = heapCount();
  restartPeak();
  measured(messages);
  const HeapCount after = heapCount();
  std::printf(
      "{\"kind\": \"%.*s\", \"name\": \"%.*s\", \"form\": \"%s\", \"messages\": %zu, \"bytes\": "
      "%zu, "
      "\"allocations\": %.3f, \"peak\": %zu",
      static_cast<int>(kind.size()), kind.data(), static_cast<int>(name.size()), name.data(),
      nameOf(form).data(), messages.size(), bytes / messages.size(),
      static_cast<double>(after.allocations - before.allocations) /
          static_cast<double>(messages.size()),
      after.peak - before.bytes);
  if (kind == "shape" && timed) std::printf(", \"nanoseconds\": %.0f", leastTime(messages[0]));
  std::printf("}\n");
}

void run(std::size_t smallest, std::size_t largest, bool timed) {
  constexpr plist::Format kForms[] = {plist::Format::binary, plist::Format::xml};
  constexpr std::size_t kStream = 256;  // messages, which suffice for counts
  const auto one = [timed](std::string_view kind, std::string_view name, plist::Format form,
                           const Data& message) {
    report(kind, name, form, {&message, 1}, timed);
  };
  for (const Sample& each : samples()) {
    for (const plist::Format form : kForms) {
      const Data message = messageOf(each.record, form);
      one("sample", each.name, form, message);
      one("wrong", each.name, form, messageOf(WrongAtLast{each.record}, form));
      one("broken", each.name, form, brokenAtLast(message, form));
    }
  }
  for (const Stream& stream : streams(kStream)) {
    for (const plist::Format form : kForms) {
      report("stream", stream.name, form, messagesOf(stream, form), timed);
    }
  }
  for (const Shape& shape : shapes()) {
    for (const plist::Format form : kForms) {
      for (std::size_t bytes = smallest; bytes <= largest; bytes *= 4) {
        const auto message = messageOfSize(shape, form, bytes);
        if (message) one("shape", shape.name, form, *message);
      }
    }
  }
}

}  // namespace
}  // namespace ironmoat::bench

int main(int argc, char** argv) {
  if (argc < 3) return EXIT_FAILURE;
  ironmoat::sandbox::prepareMemory();  // as the service does
  const auto number = [](const char* text) { return std::strtoull(text, nullptr, 10); };
  ironmoat::bench::run(number(argv[1]), number(argv[2]),
                       argc > 3 && std::string_view(argv[3]) == "time");
}
