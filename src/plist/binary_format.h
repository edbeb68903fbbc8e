#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

/// The binary format: header, objects, a table of their offsets, a trailer. All integers are
/// big-endian.
///
///     file    = "bplist00" object+ offset{objectCount} trailer
///     offset  = uint(offsetSize)                          from the start of the file
///     trailer = pad(5) sortVersion(1) offsetSize(1) referenceSize(1)
///               objectCount(8) topObject(8) offsetTable(8)
///     object  = 0x00 | 0x08 | 0x09                        null, false, true
///             | 0x1n byte{2^n}                            integer, n = 0..4; signed from 8 bytes
///             | 0x22 byte{4} | 0x23 byte{8}               real
///             | 0x33 byte{8}                              date
///             | 0x4c length byte*                         data
///             | 0x5c length byte*                         ASCII text
///             | 0x6c length unit*                         UTF-16 text, length in units
///             | 0x8n byte{n+1}                            UID
///             | 0xAc length reference*                    array
///             | 0xCc length reference*                    set
///             | 0xDc length reference* reference*         dictionary: keys, then values
///     length  = nothing, when c < 15: the length is c     | integer object, when c = 15
///
/// The format itself permits overlapping objects, cycles of references and lengths that exceed the
/// message. The reader rejects them.
namespace ironmoat::plist::binary {

inline constexpr std::string_view kHeader = "bplist00";
inline constexpr std::size_t kTrailerSize = 32;
inline constexpr std::size_t kMaxSize = 8;  // bytes of an offset or a reference

enum class Marker : std::uint8_t {
  simple = 0x0,
  integer = 0x1,
  real = 0x2,
  date = 0x3,
  data = 0x4,
  ascii = 0x5,
  utf16 = 0x6,
  uid = 0x8,
  array = 0xA,
  set = 0xC,
  dictionary = 0xD,
};
inline constexpr std::uint8_t kNull = 0x00;
inline constexpr std::uint8_t kFalse = 0x08;
inline constexpr std::uint8_t kTrue = 0x09;
inline constexpr std::uint8_t kLengthFollows = 0x0F;

}  // namespace ironmoat::plist::binary
