#pragma once

#include <cstddef>
#include <cstdint>

/// What one message may cost. Over any of these a message is refused with `limitExceeded`; nothing
/// is allocated ahead of the check and nothing of the message is kept.
namespace ironmoat::limits {

/// Bytes of one message. Bounds frames, blocks and every 32-bit offset into them.
inline constexpr std::size_t messageBytes = std::size_t{16} << 20;

/// Containers inside one another, the top-level dictionary counted as the first; a payload within
/// a payload takes two (the list and the dictionary). Stops stack exhaustion: decoding, conversion,
/// encoding and destruction recurse at most this deep.
inline constexpr std::uint32_t nestedContainers = 512;

/// Bytes that lists take in wire records (elements × size of one, texts 16 bytes) and that the
/// values of payloads take (16 bytes for each present), counted before they are allocated. Stops
/// a few bytes of input (`<dict/>`, or one shared object referenced over and over) from asking for
/// a whole record each time. Measured: 155,344 tiny payloads of 432 bytes fill it, from 2.6 MB of
/// message when each is its own object and from 155 KB when they are one, under references of one
/// byte each: 121 MiB at the peak, output records included, and 0.17 s on a busy machine. A
/// list of a million is rejected in 1.4 ms before anything is allocated for it.
inline constexpr std::size_t recordBytes = std::size_t{64} << 20;

/// Bytes of text and data delivered into fields, counted each time a shared value is used. Stops a
/// shared megabyte referenced thousands of times from becoming gigabytes of reply.
inline constexpr std::size_t deliveredBytes = std::size_t{64} << 20;

/// Dictionary entries looked at while decoding, counted each time a shared dictionary is. A message
/// that shares none has fewer: an entry takes two bytes at least. Stops a dictionary of a million
/// unknown keys from being scanned once for each of thousands of references to it. Measured at the
/// worst, 1.2 million shuffled keys scanned over and over: 0.3 s.
inline constexpr std::size_t scannedEntries = std::size_t{8} << 20;

/// Bytes of one reply. No record can exceed it: its text and data are bounded by `deliveredBytes`,
/// and everything else takes less room in a reply than in `recordBytes`.
inline constexpr std::size_t replyBytes = std::size_t{144} << 20;

}  // namespace ironmoat::limits
