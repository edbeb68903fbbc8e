// Target: the frame assembler and the parsers of all frames. The first byte chooses how the rest,
// the bytes of one connection, is split into reads. The split must not change the outcome, and a
// parsed frame, written again, must be the same bytes. (S14)

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "support/request_frame.h"
#include "support/tight_message.h"

namespace {

using namespace ironmoat;
using namespace ironmoat::frames;

constexpr std::size_t kMaxBody = 100'000;

struct Outcome {
  std::vector<Data> bodies;
  bool broken = false;
  bool midFrame = false;
};

/// Sizes of reads, from a random number generator seeded with `seed`. If it is 0, each read takes
/// as much as fits.
Outcome assemble(std::string_view stream, std::uint32_t seed) {
  FrameAssembler assembler(kMaxBody, Sharing::anyThread);
  Outcome outcome;
  std::uint32_t state = seed;
  try {
    while (!stream.empty()) {
      const std::span<char> room = assembler.room();
      if (room.empty()) std::abort();
      std::size_t count = std::min(room.size(), stream.size());
      if (seed != 0) {
        state = state * 1664525 + 1013904223;
        const std::size_t most = std::size_t{1} << (state >> 28);
        count = std::min(count, 1 + (state >> 8) % most);
      }
      stream.copy(room.data(), count);
      stream.remove_prefix(count);
      assembler.commit(count);
      while (auto body = assembler.next()) outcome.bodies.push_back(*std::move(body));
    }
    outcome.midFrame = assembler.midFrame();
  } catch (const FrameError&) {
    outcome.broken = true;
  }
  return outcome;
}

/// Requires that `append` writes what `parse` returns, if anything, as the frame of `body`.
template <class Parse, class Append>
void expectSame(const Data& body, Parse parse, Append append) {
  std::optional<decltype(parse(body))> parsed;
  try {
    parsed.emplace(parse(body));
  } catch (const FrameError&) {
    return;
  }
  BlockBuilder out;
  append(out, *parsed);
  const std::string_view frame(out.bytes(), out.size());
  if (frame.substr(kLengthBytes) != body.view()) std::abort();
  const Outcome again = assemble(frame, 0);
  if (again.bodies.size() != 1 || again.bodies[0] != body || again.midFrame) std::abort();
}

void parse(const Data& body) {
  expectSame(body, parseHello, appendHello);
  expectSame(body, parseRequest, [&](BlockBuilder& out, const Request& request) {
    if (requestId(body) != request.id) std::abort();
    appendRequest(out, request.id, request.outputType, request.message.view());
  });
  expectSame(body, parseReply, [&](BlockBuilder& out, const Reply& reply) {
    const std::size_t start = beginReply(out, reply.id, reply.status);
    out.append(reply.body.view());
    endReply(out, start);
    const auto inside = [&](const auto& parse) {
      return [&](const Data&) { return parse(reply.body); };
    };
    if (reply.status == Status::rejected) {
      expectSame(body, inside(parseRejection),
                 [&](BlockBuilder& again, const DecodingError& error) {
                   appendRejection(again, reply.id, error);
                 });
    } else if (reply.status != Status::record) {
      expectSame(body, inside(parseDescription), [&](BlockBuilder& again, const std::string& text) {
        appendDescription(again, reply.id, reply.status, text);
      });
    }
  });
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  const std::string_view stream(reinterpret_cast<const char*>(data) + 1, size - 1);
  const Outcome whole = assemble(stream, 0);
  const Outcome split = assemble(stream, data[0]);
  if (whole.bodies != split.bodies || whole.broken != split.broken ||
      whole.midFrame != split.midFrame) {
    std::abort();
  }
  for (const Data& body : whole.bodies) parse(testing::tightMessage(body.view()));
  return 0;
}
