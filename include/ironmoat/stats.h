#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

namespace ironmoat {

/// What a client has done since it was made. The totals are read one after the other while the
/// client works, so that they may differ by the requests that finish meanwhile.
struct Stats {
  /// Rejections are counted by `DecodingError::Kind`, its value being the index.
  static constexpr std::size_t kRejectionKinds = 8;

  std::uint64_t accepted = 0;  ///< requests with a record
  std::array<std::uint64_t, kRejectionKinds> rejected{};
  std::uint64_t crashed = 0;
  std::uint64_t timedOut = 0;
  std::uint64_t unavailable = 0;
  std::uint64_t outOfMemory = 0;  ///< requests that ended in std::bad_alloc in this process
  std::uint64_t cancelled = 0;
  std::uint64_t retried = 0;  ///< times that a request was sent again after its process was lost

  std::uint64_t started = 0;        ///< service processes
  std::uint64_t ended = 0;          ///< of these, processes that are gone
  std::uint64_t retired = 0;        ///< of those, processes replaced for their age
  std::uint64_t limitedMemory = 0;  ///< of `started`, processes with an address space below 1 GiB

  std::uint64_t inFlight =
      0;  ///< requests without an outcome, or whose completion was not called yet
  std::uint64_t bytesInFlight = 0;  ///< bytes of their messages
  std::uint64_t bytesHeld = 0;      ///< bytes of records that were not taken yet
};

}  // namespace ironmoat
