// Ways to make and keep values that work, and with each CASE_ one that loses bytes.

#include "ironmoat/values.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "ironmoat/user_payload.h"

namespace ironmoat {

inline void make(const std::string& text, const std::vector<char>& chars,
                 const std::vector<unsigned char>& octets, std::span<const std::byte> bytes,
                 std::span<std::uint8_t> writable, const void* received, char (&buffer)[64],
                 const char* pointer) {
  for (const Data& data :
       {Data(text), Data(std::string_view(text)), Data(chars), Data(octets), Data(bytes),
        Data(writable), Data(std::array<std::uint8_t, 16>()), Data(buffer, 5), Data(pointer, 5),
        Data(static_cast<const std::byte*>(received), 5), Data("a literal"), Data()}) {
    static_cast<void>(data);
  }
  for (const String& value : {String(text), String("a literal"), String(std::string_view(pointer)),
                              String({buffer, 5}), String()}) {
    static_cast<void>(value);
  }
#ifdef CASE_data_of_array
  Data{buffer};
#elif defined(CASE_data_of_constant_array)
  const char constant[] = {buffer[0], buffer[1]};
  Data{constant};
#elif defined(CASE_data_of_unended_array)
  constexpr static char constant[] = {'a', 'b'};
  Data{constant};
#elif defined(CASE_data_of_pointer)
  Data{pointer};
#elif defined(CASE_data_of_wide_elements)
  Data(std::vector<int>());
#elif defined(CASE_text_of_array)
  String{buffer};
#elif defined(CASE_text_of_pointer)
  String{pointer};
#elif defined(CASE_text_of_nothing)
  String{nullptr};
#endif
}

inline Optional<String> keep(const DrelUserPayload& payload) {
#ifdef CASE_field_kept_without_its_record
  auto kept = payload.traceId;
#else
  Optional<String> kept = payload.traceId;
#endif
  return kept;
}

}  // namespace ironmoat
