#pragma once

#include <cstddef>
#include <cstdint>

/// What one message may cost. A message that exceeds one of these limits is rejected with
/// `limitExceeded`. Each limit is checked before memory is allocated for what it counts.
namespace ironmoat::limits {

/// Bytes of one message. Bounds frames, blocks and every 32-bit offset into them.
inline constexpr std::size_t messageBytes = std::size_t{16} << 20;

/// Nested containers, the top-level dictionary included. A payload in a payload counts as two: a
/// list and a dictionary. Prevents stack exhaustion, because decoding, conversion, encoding and
/// destruction recurse at most this deep.
inline constexpr std::uint32_t nestedContainers = 512;

/// Bytes of wire records: lists (elements × size of one; a text has 16 bytes) and the values of
/// payloads (16 bytes for each field that is present). Prevents a few bytes of input, such as
/// `<dict/>` or a repeated reference to one object, from taking a whole record each time. 155,344
/// empty payloads of 432 bytes reach the limit, in a message of 2.6 MB, or of 155 KB if they are
/// references to one object.
inline constexpr std::size_t recordBytes = std::size_t{64} << 20;

/// Bytes of text and data in fields, counted each time that a shared value is used. Prevents a
/// megabyte that is referenced thousands of times from becoming gigabytes of reply.
inline constexpr std::size_t deliveredBytes = std::size_t{64} << 20;

/// Dictionary entries scanned while decoding, counted each time that a shared dictionary is
/// scanned. Prevents a dictionary of a million unknown keys from being scanned once for each of
/// thousands of references to it. A message without shared dictionaries cannot reach the limit,
/// because an entry takes at least two bytes.
inline constexpr std::size_t scannedEntries = std::size_t{8} << 20;

/// Bytes of one reply. No record can exceed it: `deliveredBytes` bounds its text and data, and
/// everything else takes fewer bytes in a reply than it counts towards `recordBytes`.
inline constexpr std::size_t replyBytes = std::size_t{144} << 20;

}  // namespace ironmoat::limits
