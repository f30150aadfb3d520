#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

namespace ferrox::engine {

// What a byte is in an identifier; 0 ends it.
constexpr uint8_t kSmallByte = 1;
constexpr uint8_t kCapitalByte = 2;
constexpr uint8_t kDigitByte = 4;
constexpr uint8_t kWideCodeByte = 8;  ///< part of a character that is not ASCII

inline constexpr std::array<uint8_t, 256> kCodeBytes = [] {
  std::array<uint8_t, 256> table{};
  for (size_t c = 'a'; c <= 'z'; ++c) table[c] = kSmallByte;
  for (size_t c = 'A'; c <= 'Z'; ++c) table[c] = kCapitalByte;
  for (size_t c = '0'; c <= '9'; ++c) table[c] = kDigitByte;
  for (size_t c = 0x80; c < 0x100; ++c) table[c] = kWideCodeByte;
  return table;
}();

inline uint8_t CodeByte(char byte) { return kCodeBytes[static_cast<unsigned char>(byte)]; }

}  // namespace ferrox::engine
