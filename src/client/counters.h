#pragma once

#include <array>
#include <atomic>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <new>
#include <type_traits>
#include <variant>

#include "ironmoat/errors.h"
#include "ironmoat/stats.h"

namespace ironmoat::client {

using Failure = std::variant<DecodingError, ServiceError, std::bad_alloc>;

/// A `Stats` that any thread may add to and read. Each number is exact by itself; no other memory
/// is ordered by them (relaxed).
class Counters {
 public:
  using Number = std::uint64_t Stats::*;

  explicit Counters(std::uint64_t maxBytesHeld = std::numeric_limits<std::uint64_t>::max()) noexcept
      : maxBytesHeld_(maxBytesHeld) {}

  void add(Number number, std::uint64_t n = 1) noexcept { add(stats_.*number, n); }
  void subtract(Number number, std::uint64_t n = 1) noexcept { add(stats_.*number, 0 - n); }

  /// Adds a record to those that are held, until `release`; false if they would exceed the limit.
  bool hold(std::uint64_t bytes) noexcept {
    std::atomic_ref held(stats_.bytesHeld);
    const std::uint64_t others = held.fetch_add(bytes, std::memory_order_relaxed);
    return others == 0 || others + bytes <= maxBytesHeld_;
  }
  void release(std::uint64_t bytes) noexcept { subtract(&Stats::bytesHeld, bytes); }

  /// An outcome; null for a record.
  void count(const Failure* failure) noexcept {
    if (failure == nullptr) return add(&Stats::accepted);
    if (const auto* const error = std::get_if<DecodingError>(failure)) {
      return add(stats_.rejected[static_cast<std::size_t>(error->kind())], 1);
    }
    const auto* const error = std::get_if<ServiceError>(failure);
    if (error == nullptr) return add(&Stats::outOfMemory);
    add(error->kind() == ServiceError::Kind::crashed    ? &Stats::crashed
        : error->kind() == ServiceError::Kind::timedOut ? &Stats::timedOut
                                                        : &Stats::unavailable);
  }

  [[nodiscard]] Stats snapshot() noexcept {
    static_assert(std::is_trivially_copyable_v<Stats>);
    std::array<std::uint64_t, sizeof(Stats) / sizeof(std::uint64_t)> numbers{};
    static_assert(sizeof numbers == sizeof(Stats), "every member is a number of 64 bits");
    auto* number = reinterpret_cast<std::uint64_t*>(&stats_);
    for (std::uint64_t& each : numbers) {
      each = std::atomic_ref(*number++).load(std::memory_order_relaxed);
    }
    return std::bit_cast<Stats>(numbers);
  }

 private:
  static void add(std::uint64_t& number, std::uint64_t n) noexcept {
    std::atomic_ref(number).fetch_add(n, std::memory_order_relaxed);
  }

  const std::uint64_t maxBytesHeld_;
  Stats stats_;
};

/// Counts a request as in flight for as long as this lives.
class InFlight {
 public:
  InFlight(Counters& counters, std::size_t bytes) noexcept : counters_(counters), bytes_(bytes) {
    counters_.add(&Stats::inFlight);
    counters_.add(&Stats::bytesInFlight, bytes_);
  }
  InFlight(const InFlight&) = delete;
  InFlight& operator=(const InFlight&) = delete;
  ~InFlight() {
    counters_.subtract(&Stats::inFlight);
    counters_.subtract(&Stats::bytesInFlight, bytes_);
  }

 private:
  Counters& counters_;
  const std::size_t bytes_;
};

}  // namespace ironmoat::client
