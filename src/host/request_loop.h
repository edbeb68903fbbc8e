#pragma once

#include <cstddef>
#include <new>
#include <optional>

#include "frames/frame.h"
#include "frames/frame_assembler.h"
#include "frames/spin.h"
#include "host/server.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

namespace ironmoat::host {

/// Serves one connection on the calling thread: answers requests in the order of their arrival, and
/// writes the replies when no whole request is left or kBatch bytes of them are waiting.
///
/// While the peer does not read, the loop blocks in a write and reads nothing: so memory is bounded
/// by one request, its reply and kBatch bytes of earlier replies. After one second without a
/// request the loop wipes and releases its memory.
class RequestLoop {
 public:
  /// The caller owns the descriptors. A socket `input` becomes non-blocking; any other is
  /// unchanged, because other processes may share it.
  RequestLoop(const IronmoatServer& server, int input, int output);

  /// Writes `hello`, then serves until the input ends, the peer stops reading, or a frame exceeds
  /// the limit on its length. Answers all requests received before that.
  void run(const frames::Hello& hello);

 private:
  static constexpr std::size_t kBatch = std::size_t{8} << 10;

  /// The next whole request, if one is received. Throws FrameError; then the input is of no use.
  std::optional<Data> take();
  void answer(const Data& request);
  /// Waits for input and reads some; false at the end of input.
  bool receive();
  /// Writes all of `replies_`; false if the peer has stopped reading.
  bool flush();
  /// Writes the replies and frees memory after an allocation has failed.
  void release();
  /// Wipes and releases the memory of earlier requests.
  void rest();
  /// Calls `act`; if memory runs out, once more after a `release`.
  template <class Act>
  auto withMemory(Act act) {
    try {
      return act();
    } catch (const std::bad_alloc&) {
      release();
    }
    return act();
  }

  const IronmoatServer& server_;
  const int input_;
  const int output_;
  bool isSocket_ = false;
  bool broken_ = false;  // the peer has stopped reading
  frames::FrameAssembler assembler_;
  BlockBuilder replies_{Sharing::oneThread};
  frames::Spin spin_;
};

}  // namespace ironmoat::host
