// Ways to make and keep values that work, and CASE, which would lose bytes.

#include "ironmoat/values.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "ironmoat/user_payload.h"

#ifndef CASE
#define CASE Data()
#endif

namespace ironmoat {

inline void make(const std::string& text, const std::vector<unsigned char>& octets,
                 std::span<std::uint8_t> writable, const void* received, char (&buffer)[64],
                 const char* pointer, const DrelUserPayload& payload) {
  static constexpr char kUnended[] = {'a', 'b'};
  static_cast<void>(std::array{Data(text), Data(std::string_view(text)), Data(octets),
                               Data(writable), Data(std::array<std::uint8_t, 16>()),
                               Data(buffer, 5), Data(kUnended, 2), Data("a literal"),
                               Data(static_cast<const std::byte*>(received), 5)});
  static_cast<void>(std::array{String(text), String("a literal"), String({buffer, 5}),
                               String(std::string_view(pointer))});
  const Optional<String> kept = payload.traceId;
  auto lost = CASE;
  static_cast<void>(lost);
}

}  // namespace ironmoat
