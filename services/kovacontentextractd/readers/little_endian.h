#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace ferrox::extract {

/// A number of up to 8 bytes in `bytes`, low byte first; 0 where it is not wholly inside, so that a reader of a damaged
/// file needs no check of its own before each number.
inline uint64_t LittleEndian(std::string_view bytes, size_t at, size_t size) {
  if (at > bytes.size() || bytes.size() - at < size) return 0;
  uint64_t value = 0;
  for (size_t i = size; i > 0; --i) value = value << 8 | static_cast<unsigned char>(bytes[at + i - 1]);
  return value;
}
// The two sizes that most formats have.
inline uint16_t Little16(std::string_view bytes, size_t at) {
  return static_cast<uint16_t>(LittleEndian(bytes, at, 2));
}
inline uint32_t Little32(std::string_view bytes, size_t at) {
  return static_cast<uint32_t>(LittleEndian(bytes, at, 4));
}

}  // namespace ferrox::extract
