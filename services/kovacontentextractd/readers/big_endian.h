#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace ferrox::extract {

/// A number of up to 8 bytes in `bytes`, high byte first; 0 where it is not wholly inside, so that a reader of a
/// damaged file needs no check of its own before each number.
inline uint64_t BigEndian(std::string_view bytes, size_t at, size_t size) {
  if (at > bytes.size() || bytes.size() - at < size) return 0;
  uint64_t value = 0;
  for (size_t i = 0; i < size; ++i) value = value << 8 | static_cast<unsigned char>(bytes[at + i]);
  return value;
}

}  // namespace ferrox::extract
