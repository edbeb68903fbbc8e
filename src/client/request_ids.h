#pragma once

#include <sys/random.h>

#include <array>
#include <cstddef>
#include <cstdint>

namespace ironmoat::client {

/// Ids that a service cannot guess before it has read them, so that nothing it sent earlier can
/// pass for the reply. 0 is not among them: it answers frames without an id.
class RequestIds {
 public:
  std::uint64_t next() noexcept {
    if (left_ == 0) refill();
    const std::uint64_t id = pool_[--left_];
    return id == 0 ? next() : id;
  }

 private:
  void refill() noexcept {
    // 256 bytes come whole; where the kernel has none to give, a counter is all that is left.
    if (::getrandom(pool_.data(), sizeof pool_, 0) != static_cast<ssize_t>(sizeof pool_)) {
      for (std::uint64_t& id : pool_) id = ++counter_;
    }
    left_ = pool_.size();
  }

  std::array<std::uint64_t, 32> pool_;  // NOLINT: read only below left_
  std::size_t left_ = 0;
  std::uint64_t counter_ = 0;
};

}  // namespace ironmoat::client
