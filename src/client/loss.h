#pragma once

#include <cstdint>
#include <new>
#include <string>

namespace ironmoat::client {

/// What ended a service process or made it useless.
struct Loss {
  enum class Why : std::uint8_t {
    ended,      ///< it ended or closed its connection by itself
    violation,  ///< it sent what no service sends
    deadline,   ///< it did not answer in time
  };
  Why why = Why::ended;
  std::string what;  ///< "was killed by SIGSEGV", "sent a broken frame: ..."
};

/// The text that `make` returns, or none for want of memory: the loss is what counts.
template <class Make>
std::string textOrNone(Make make) noexcept {
  try {
    return make();
  } catch (const std::bad_alloc&) {
    return {};
  }
}

}  // namespace ironmoat::client
