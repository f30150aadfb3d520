#include "services/kovacontentextractd/readers/utf8_blocks.h"

#if defined(__x86_64__) || defined(__i386__)

#include <immintrin.h>

#include <cstdint>

namespace ferrox::extract {

namespace {

// What is wrong with two bytes in a row, one bit for each way. The upper and the lower half of the first byte and the
// upper half of the second one each tell, by a table of 16, what may be wrong; what all three tell, is. (J. Keiser,
// D. Lemire: Validating UTF-8 in less than one instruction per byte, 2021.)
constexpr uint8_t kShort = 1;       // a first byte, and no further one
constexpr uint8_t kLong = 2;        // ASCII, and a further byte
constexpr uint8_t kOverlong3 = 4;   // E0, and less than A0
constexpr uint8_t kLarge = 8;       // F4, and more than 8F; what is above F4, and 90 to BF
constexpr uint8_t kSurrogate = 16;  // ED, and more than 9F
constexpr uint8_t kOverlong2 = 32;  // C0 or C1
constexpr uint8_t kOverlong4 = 64;  // F0, and less than 90; what is above F4, and 80 to 8F
constexpr uint8_t kTwoFurther =
    128;  // two further bytes, which is right only behind the first byte of a long character

// Ways for which the lower half does not matter; those of F5 to FF; those of any further byte as the second one.
constexpr uint8_t kAny = kShort | kLong | kTwoFurther;
constexpr uint8_t kAbove = kAny | kLarge | kOverlong4;
constexpr uint8_t kFurther = kLong | kOverlong2 | kTwoFurther;

// clang-format off
alignas(16) constexpr uint8_t kFirstUpper[16] = {
    kLong, kLong, kLong, kLong, kLong, kLong, kLong, kLong,  // 00 to 7F
    kTwoFurther, kTwoFurther, kTwoFurther, kTwoFurther,      // 80 to BF
    kShort | kOverlong2, kShort, kShort | kOverlong3 | kSurrogate, kShort | kLarge | kOverlong4};
alignas(16) constexpr uint8_t kFirstLower[16] = {
    kAny | kOverlong2 | kOverlong3 | kOverlong4, kAny | kOverlong2, kAny, kAny, kAny | kLarge,
    kAbove, kAbove, kAbove, kAbove, kAbove, kAbove, kAbove, kAbove, kAbove | kSurrogate, kAbove, kAbove};
alignas(16) constexpr uint8_t kSecondUpper[16] = {
    kShort, kShort, kShort, kShort, kShort, kShort, kShort, kShort,  // 00 to 7F
    kFurther | kOverlong3 | kOverlong4, kFurther | kOverlong3 | kLarge,
    kFurther | kSurrogate | kLarge, kFurther | kSurrogate | kLarge,
    kShort, kShort, kShort, kShort};                                 // C0 to FF
// clang-format on

/// For functions with instructions that not every processor of this architecture has; callers ask first.
#define FERROX_SSSE3 __attribute__((target("ssse3")))

FERROX_SSSE3 __m128i Load(const uint8_t* bytes) { return _mm_loadu_si128(reinterpret_cast<const __m128i*>(bytes)); }

FERROX_SSSE3 __m128i UpperHalves(__m128i bytes) { return _mm_and_si128(_mm_srli_epi16(bytes, 4), _mm_set1_epi8(0x0F)); }

/// Whether a block, together with the end of the one before it, has nothing wrong.
FERROX_SSSE3 bool IsRight(__m128i block, __m128i before) {
  const __m128i first = _mm_alignr_epi8(block, before, 15);
  const __m128i by_first =
      _mm_and_si128(_mm_shuffle_epi8(Load(kFirstUpper), UpperHalves(first)),
                    _mm_shuffle_epi8(Load(kFirstLower), _mm_and_si128(first, _mm_set1_epi8(0x0F))));
  const __m128i wrong = _mm_and_si128(by_first, _mm_shuffle_epi8(Load(kSecondUpper), UpperHalves(block)));
  // Exactly two places behind a byte from E0 on, and three behind one from F0 on, there must be two further bytes.
  const __m128i third = _mm_subs_epu8(_mm_alignr_epi8(block, before, 14), _mm_set1_epi8(0xE0 - 0x80));
  const __m128i fourth = _mm_subs_epu8(_mm_alignr_epi8(block, before, 13), _mm_set1_epi8(0xF0 - 0x80));
  const __m128i must = _mm_and_si128(_mm_or_si128(third, fourth), _mm_set1_epi8(static_cast<char>(kTwoFurther)));
  return _mm_movemask_epi8(_mm_cmpeq_epi8(must, wrong)) == 0xFFFF;
}

/// How many bytes at the beginning lie in blocks without fault.
FERROX_SSSE3 size_t RightBlocks(const unsigned char* bytes, size_t size) {
  size_t at = 0;
  for (__m128i before = _mm_setzero_si128(); size - at >= 16; at += 16) {
    const __m128i block = Load(bytes + at);
    if (!IsRight(block, before)) break;
    before = block;
  }
  return at;
}

}  // namespace

size_t ValidUtf8Blocks(const unsigned char* bytes, size_t size) {
  static const bool can = __builtin_cpu_supports("ssse3") != 0;
  const size_t right = can ? RightBlocks(bytes, size) : 0;
  for (size_t back = 1; back <= 3 && back <= right; ++back) {  // the last character may go on behind the block
    if (bytes[right - back] >= 0xC0) return right - back;
  }
  return right;
}

}  // namespace ferrox::extract

#else

size_t ferrox::extract::ValidUtf8Blocks(const unsigned char*, size_t) { return 0; }

#endif
