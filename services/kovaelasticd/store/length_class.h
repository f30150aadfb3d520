#pragma once

#include <bit>
#include <cstdint>

namespace ferrox::engine {

// The length of a document's text in one byte, for sums over many documents: 0 is none, the others are eight steps for
// each doubling. A length stands for at most 1/16 more or less than it was.

inline constexpr int kLengthClasses = 256;

/// The class of a text of so many bytes.
inline uint8_t LengthClass(int64_t bytes) {
  if (bytes <= 0) return 0;
  const auto length = static_cast<uint64_t>(bytes);
  const int power = std::bit_width(length) - 1;
  const uint64_t step = (power >= 3 ? length >> (power - 3) : length << (3 - power)) - 8;
  const uint64_t number = 1 + static_cast<uint64_t>(power) * 8 + step;
  return number < kLengthClasses ? static_cast<uint8_t>(number) : kLengthClasses - 1;
}

/// The length that stands for all of its class: the middle.
inline int64_t LengthOfClass(uint8_t number) {
  if (number == 0) return 0;
  const int power = (number - 1) / 8;
  const int64_t from = 8 + (number - 1) % 8;
  return power >= 4 ? ((from << (power - 3)) + (int64_t{1} << (power - 4))) : (from << power) / 8;
}

}  // namespace ferrox::engine
