#pragma once

#include <cstddef>
#include <cstdint>

namespace ferrox::engine {

/// The checksums that tell whether a page came back from the disk as it was written (docs/formats/engine.md, "Files").
/// A page of a checked file ends in kChecksumBytes bytes that SQLite leaves alone ("reserved bytes", of which byte 20
/// of the file's header tells the number). They hold the page's checksum, a 64-bit number with the lowest byte first.

/// How many bytes at each page's end are the checksum's.
inline constexpr int kChecksumBytes = 8;

/// The checksum of the page of `size` bytes, a multiple of 8, over all of it but its last kChecksumBytes. The page's
/// number, which counts from 1, goes into it: a page that was written to another's place is found as well. Every change
/// within one 8-byte word changes it; other changes go unseen with a probability of about 2^-64.
uint64_t PageChecksum(const uint8_t* page, size_t size, uint32_t number);

/// Writes the page's checksum into its last bytes.
void SealPage(uint8_t* page, size_t size, uint32_t number);

/// Whether the page's last bytes are its checksum.
bool IsPageWhole(const uint8_t* page, size_t size, uint32_t number);

// A write-ahead log is checked by the checksums that SQLite itself writes into it. They are a chain: each frame's goes
// on from that of the frame before, the first one's from that in the log's header.
inline constexpr int kLogHeaderBytes = 32;
inline constexpr int kFrameHeaderBytes = 24;
inline constexpr int kLogHeaderSumAt = 24;    ///< where the log's header has its checksum, 8 bytes
inline constexpr int kFrameHeaderSumAt = 16;  ///< where a frame's header has the frame's

/// Whether a frame of a write-ahead log is whole: its header, its page of `size` bytes, and the 8 bytes of the checksum
/// before it.
bool IsFrameWhole(const uint8_t* header, const uint8_t* page, size_t size, const uint8_t* sum_before);

}  // namespace ferrox::engine
