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

/// Serves one connection on the calling thread: answers each request in the order of arrival, and
/// writes the replies once no whole request is left or enough of them have gathered.
///
/// Blocks in a write while the peer does not read, and reads nothing meanwhile: what the service
/// holds is bounded by one request, its reply and kBatch bytes of earlier replies. After kIdle
/// without a request it wipes and releases its memory.
class RequestLoop {
 public:
  /// The descriptors stay the caller's. `input` becomes nonblocking if it is a socket; anything
  /// else may be shared with other processes and is left as it is.
  RequestLoop(const IronmoatServer& server, int input, int output);

  /// Writes `hello`, then serves until the end of input, until the peer stops reading, or until a
  /// frame exceeds the limit on its length; everything received before that is answered.
  void run(const frames::Hello& hello);

 private:
  static constexpr std::size_t kBatch = std::size_t{8} << 10;

  /// The next request that has arrived whole. Throws FrameError after which the input is useless.
  std::optional<Data> take();
  void answer(const Data& request);
  /// Waits for input and reads some; false at its end.
  bool receive();
  /// Writes what `replies_` holds; false once the peer has stopped reading.
  bool flush();
  /// Makes room after an allocation has failed.
  void release();
  /// Wipes and releases what earlier requests have left in memory.
  void rest();
  /// `act`, a second time after a `release` if memory ran out.
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
