#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace ferrox::engine {

// Numbers as packed columns have them: 7 bits at a time, the lowest first, with bit 7 set on all bytes but the last.
// Signed ones have the sign in bit 0 (zigzag), so that small negative numbers are short.

inline void PutNumber(std::string& out, uint64_t value) {
  for (; value >= 0x80; value >>= 7) out += static_cast<char>(value | 0x80);
  out += static_cast<char>(value);
}

inline void PutSigned(std::string& out, int64_t value) {
  PutNumber(out, (static_cast<uint64_t>(value) << 1) ^ static_cast<uint64_t>(value >> 63));
}

/// Cuts a number off the beginning. False when there is none.
inline bool CutNumber(std::string_view& bytes, uint64_t& value) {
  value = 0;
  for (unsigned shift = 0; shift < 64 && !bytes.empty(); shift += 7) {
    const auto byte = static_cast<uint8_t>(bytes.front());
    bytes.remove_prefix(1);
    value |= static_cast<uint64_t>(byte & 0x7F) << shift;
    if (byte < 0x80) return true;
  }
  return false;
}

inline int64_t Unzigzag(uint64_t zigzag) {
  return static_cast<int64_t>(zigzag >> 1) ^ -static_cast<int64_t>(zigzag & 1);
}

inline bool CutSigned(std::string_view& bytes, int64_t& value) {
  uint64_t zigzag = 0;
  if (!CutNumber(bytes, zigzag)) return false;
  value = Unzigzag(zigzag);
  return true;
}

}  // namespace ferrox::engine
