#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <variant>

#include "client/request.h"
#include "ironmoat/stats.h"

namespace ironmoat::client {

/// The running totals behind `Stats`. Any thread may add and read; each is exact by itself, and
/// nothing is ordered by them (relaxed).
class Counters {
 public:
  class Counter {
   public:
    void add(std::uint64_t n = 1) noexcept { value_.fetch_add(n, std::memory_order_relaxed); }
    void subtract(std::uint64_t n) noexcept { value_.fetch_sub(n, std::memory_order_relaxed); }
    [[nodiscard]] std::uint64_t get() const noexcept {
      return value_.load(std::memory_order_relaxed);
    }

   private:
    std::atomic<std::uint64_t> value_ = 0;
  };

  Counter accepted;
  Counter rejected[Stats::kRejectionKinds];
  Counter crashed;
  Counter timedOut;
  Counter unavailable;
  Counter outOfMemory;
  Counter cancelled;
  Counter retried;
  Counter started;
  Counter ended;
  Counter retired;
  Counter limitedMemory;
  Counter inFlight;
  Counter bytesInFlight;

  /// An outcome: null for a record.
  void count(const Failure* failure) noexcept {
    if (failure == nullptr) return accepted.add();
    if (const auto* const error = std::get_if<DecodingError>(failure)) {
      return rejected[static_cast<std::size_t>(error->kind())].add();
    }
    const auto* const error = std::get_if<ServiceError>(failure);
    if (error == nullptr) return outOfMemory.add();
    (error->kind() == ServiceError::Kind::crashed    ? crashed
     : error->kind() == ServiceError::Kind::timedOut ? timedOut
                                                     : unavailable)
        .add();
  }

  [[nodiscard]] Stats snapshot() const noexcept {
    Stats stats;
    stats.accepted = accepted.get();
    for (std::size_t i = 0; i < Stats::kRejectionKinds; ++i) stats.rejected[i] = rejected[i].get();
    stats.crashed = crashed.get();
    stats.timedOut = timedOut.get();
    stats.unavailable = unavailable.get();
    stats.outOfMemory = outOfMemory.get();
    stats.cancelled = cancelled.get();
    stats.retried = retried.get();
    stats.started = started.get();
    stats.ended = ended.get();
    stats.retired = retired.get();
    stats.limitedMemory = limitedMemory.get();
    stats.inFlight = inFlight.get();
    stats.bytesInFlight = bytesInFlight.get();
    return stats;
  }
};

/// Counts a request for as long as it has no outcome.
class InFlight {
 public:
  InFlight(Counters& counters, std::size_t bytes) noexcept : counters_(counters), bytes_(bytes) {
    counters_.inFlight.add();
    counters_.bytesInFlight.add(bytes_);
  }
  InFlight(const InFlight&) = delete;
  InFlight& operator=(const InFlight&) = delete;
  ~InFlight() {
    counters_.inFlight.subtract(1);
    counters_.bytesInFlight.subtract(bytes_);
  }

 private:
  Counters& counters_;
  const std::size_t bytes_;
};

}  // namespace ironmoat::client
