// growth SMALLEST LARGEST [time]: what unpacking costs against the message's size, for each shape
// and sample in each form and what is refused at its end, as JSON lines: bytes of the message,
// allocations, peak bytes of heap and, when asked, the least CPU nanoseconds of several runs.
//
// Every unpacking to be counted goes through `measured`, once, in the order of the lines: under
// callgrind with --toggle-collect and --dump-after on it, instructions come out in the same order.

#include <time.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <string_view>

#include "confinement/memory.h"
#include "heap_count.h"
#include "messages.h"
#include "shapes.h"
#include "unpackers/corvel_payload_unpacker.h"

static void unpackOnce(const ironmoat::Data& message) {
  try {
    const auto record = ironmoat::VeskCorvelPayloadUnpacker().unpack(message);
    asm volatile("" : : "r"(&record) : "memory");
  } catch (const ironmoat::DecodingError&) {
  }
}

extern "C" [[gnu::noinline]] void measured(const ironmoat::Data& message) { unpackOnce(message); }

namespace ironmoat::bench {
namespace {

double cpuNanoseconds() {
  timespec now{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return 1e9 * static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec);
}

/// Of one unpacking, in batches that take long enough for the clock.
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

void report(std::string_view kind, std::string_view name, plist::Form form, const Data& message,
            bool timed) {
  const HeapCount before = heapCount();
  restartPeak();
  measured(message);
  const HeapCount after = heapCount();
  std::printf(
      "{\"kind\": \"%.*s\", \"name\": \"%.*s\", \"form\": \"%s\", \"bytes\": %zu, "
      "\"allocations\": %zu, \"peak\": %zu",
      static_cast<int>(kind.size()), kind.data(), static_cast<int>(name.size()), name.data(),
      nameOf(form).data(), message.size(), after.allocations - before.allocations,
      after.peak - before.bytes);
  if (timed) std::printf(", \"nanoseconds\": %.0f", leastTime(message));
  std::printf("}\n");
}

void run(std::size_t smallest, std::size_t largest, bool timed) {
  constexpr plist::Form kForms[] = {plist::Form::binary, plist::Form::xml};
  const VeskCorvelProtocolPayload& full = sample("full").record;
  for (const plist::Form form : kForms) {  // what happens once in a process
    unpackOnce(messageOf(full, form));
    unpackOnce(messageOf(WrongAtLast{full}, form));
    unpackOnce(brokenAtLast(messageOf(full, form), form));
  }
  for (const Sample& each : samples()) {
    for (const plist::Form form : kForms) {
      const Data message = messageOf(each.record, form);
      report("sample", each.name, form, message, timed);
      report("wrong", each.name, form, messageOf(WrongAtLast{each.record}, form), timed);
      report("broken", each.name, form, brokenAtLast(message, form), timed);
    }
  }
  for (const Shape& shape : shapes()) {
    for (const plist::Form form : kForms) {
      for (std::size_t bytes = smallest; bytes <= largest; bytes *= 4) {
        const auto message = messageOfSize(shape, form, bytes);
        if (message) report("shape", shape.name, form, *message, timed);
      }
    }
  }
}

}  // namespace
}  // namespace ironmoat::bench

int main(int argc, char** argv) {
  if (argc < 3) return EXIT_FAILURE;
  ironmoat::confinement::prepareMemory();  // as the service does
  const auto number = [](const char* text) { return std::strtoull(text, nullptr, 10); };
  ironmoat::bench::run(number(argv[1]), number(argv[2]),
                       argc > 3 && std::string_view(argv[3]) == "time");
}
