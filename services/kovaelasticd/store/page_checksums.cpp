#include "services/kovaelasticd/store/page_checksums.h"

#include <endian.h>

#include <bit>
#include <cstring>

namespace ferrox::engine {

namespace {

/// Bytes of no particular alignment as a number, the lowest byte first.
uint64_t PageWord(const uint8_t* bytes) {
  uint64_t word = 0;
  memcpy(&word, bytes, sizeof(word));
  return le64toh(word);
}

uint32_t BigEndianWord(const uint8_t* bytes) {
  uint32_t word = 0;
  memcpy(&word, bytes, sizeof(word));
  return be32toh(word);
}

uint32_t LittleEndianWord(const uint8_t* bytes) {
  uint32_t word = 0;
  memcpy(&word, bytes, sizeof(word));
  return le32toh(word);
}

/// One step of the checksum. For a given word it is a one-to-one mapping of states, and for a given state one of words:
/// two inputs that differ in one word never meet again. The rotation takes the high bits, which the multiplication
/// carries out of the number, to where the next one spreads them.
uint64_t MixPageWord(uint64_t state, uint64_t word) {
  constexpr uint64_t kOddFactor = 0x9E3779B97F4A7C15;  // 2^64 divided by the golden ratio: ones and zeros well mixed
  return std::rotl((state ^ word) * kOddFactor, 29);
}

/// SQLite's checksum of a log, as its file format defines it: pairs of 32-bit words, whose byte order is that of the
/// host that began the log.
template <uint32_t (*kWord)(const uint8_t*)>
class LogSum {
 public:
  explicit LogSum(const uint8_t* before) : first_(BigEndianWord(before)), second_(BigEndianWord(before + 4)) {}
  void Add(const uint8_t* bytes, size_t size) {
    for (size_t at = 0; at < size; at += 8) {
      first_ += kWord(bytes + at) + second_;
      second_ += kWord(bytes + at + 4) + first_;
    }
  }
  bool IsAt(const uint8_t* stored) const {
    return first_ == BigEndianWord(stored) && second_ == BigEndianWord(stored + 4);
  }

 private:
  uint32_t first_;
  uint32_t second_;
};

template <uint32_t (*kWord)(const uint8_t*)>
bool IsLogSumOfFrame(const uint8_t* header, const uint8_t* page, size_t size, const uint8_t* sum_before) {
  LogSum<kWord> sum(sum_before);
  sum.Add(header, 8);  // the page's number, and of a commit the number of pages
  sum.Add(page, size);
  return sum.IsAt(header + kFrameHeaderSumAt);
}

}  // namespace

/// Four independent sums of every fourth word, which the processor works on at the same time.
uint64_t PageChecksum(const uint8_t* page, size_t size, uint32_t number) {
  uint64_t lane[4] = {number, 1, 2, 3};
  const uint8_t* const end = page + size - kChecksumBytes;
  for (; end - page >= 32; page += 32) {
    lane[0] = MixPageWord(lane[0], PageWord(page));
    lane[1] = MixPageWord(lane[1], PageWord(page + 8));
    lane[2] = MixPageWord(lane[2], PageWord(page + 16));
    lane[3] = MixPageWord(lane[3], PageWord(page + 24));
  }
  for (; page < end; page += 8) lane[0] = MixPageWord(lane[0], PageWord(page));
  const uint64_t sum = MixPageWord(MixPageWord(MixPageWord(lane[0], lane[1]), lane[2]), lane[3]);
  return sum ^ (sum >> 32);
}

void SealPage(uint8_t* page, size_t size, uint32_t number) {
  const uint64_t stored = htole64(PageChecksum(page, size, number));
  memcpy(page + size - kChecksumBytes, &stored, sizeof(stored));
}

bool IsPageWhole(const uint8_t* page, size_t size, uint32_t number) {
  return PageWord(page + size - kChecksumBytes) == PageChecksum(page, size, number);
}

/// Hosts of either byte order may have begun the log; nearly always it was this one.
bool IsFrameWhole(const uint8_t* header, const uint8_t* page, size_t size, const uint8_t* sum_before) {
  constexpr bool kLittle = std::endian::native == std::endian::little;
  constexpr auto kOfThisHost = kLittle ? &LittleEndianWord : &BigEndianWord;
  constexpr auto kOfTheOther = kLittle ? &BigEndianWord : &LittleEndianWord;
  return IsLogSumOfFrame<kOfThisHost>(header, page, size, sum_before) ||
         IsLogSumOfFrame<kOfTheOther>(header, page, size, sum_before);
}

}  // namespace ferrox::engine
