// Catches a byte sequence on which the fast check of UTF-8 differs from the definition.
#include "services/kovacontentextractd/readers/utf8.h"

#include <random>
#include <string>
#include <string_view>

#include <gtest/gtest.h>

namespace ferrox::test {
namespace {

using extract::ValidUtf8Prefix;

/// By the definition: the code point of each character, and that it needs as many bytes.
size_t SlowPrefix(std::string_view text) {
  size_t at = 0;
  while (at < text.size()) {
    const auto lead = static_cast<unsigned char>(text[at]);
    const size_t length = lead < 0x80    ? 1
                          : lead >= 0xF8 ? 0
                          : lead >= 0xF0 ? 4
                          : lead >= 0xE0 ? 3
                          : lead >= 0xC0 ? 2
                                         : 0;
    if (length == 0 || length > text.size() - at) return at;
    uint32_t code = length == 1 ? lead : lead & (0x7FU >> length);
    for (size_t i = 1; i < length; ++i) {
      const auto next = static_cast<unsigned char>(text[at + i]);
      if ((next & 0xC0) != 0x80) return at;
      code = (code << 6) | (next & 0x3F);
    }
    constexpr uint32_t kLeast[] = {0, 0, 0x80, 0x800, 0x10000};
    if (code < kLeast[length] || code > 0x10FFFF || (code >= 0xD800 && code <= 0xDFFF)) return at;
    at += length;
  }
  return at;
}

TEST(Utf8Test, EveryBorderOfWhatIsValidIsFoundAtEveryPlace) {
  constexpr unsigned char kBytes[] = {0x41, 0x80, 0x8F, 0x90, 0x9F, 0xA0, 0xBF, 0xC1, 0xC2,
                                      0xDF, 0xE0, 0xE1, 0xED, 0xEF, 0xF0, 0xF3, 0xF4, 0xF5};
  constexpr size_t kCount = sizeof(kBytes);
  for (size_t before = 0; before < 20; ++before) {
    std::string text(before + 4 + 20, 'a');
    for (size_t four = 0; four < kCount * kCount * kCount * kCount; ++four) {
      for (size_t i = 0, rest = four; i < 4; ++i, rest /= kCount)
        text[before + i] = static_cast<char>(kBytes[rest % kCount]);
      ASSERT_EQ(SlowPrefix(text), ValidUtf8Prefix(text)) << before << " before the bytes of number " << four;
    }
  }
}

TEST(Utf8Test, AsTheDefinitionSaysOnRandomText) {
  constexpr const char* kCharacters[] = {"a", " ", "\u00e4", "\u0436", "\u4e2d", "\u20ac", "\U0001f600", "\U0010ffff"};
  std::mt19937 random(5);
  for (int i = 0; i < 100000; ++i) {
    std::string text;
    for (size_t left = random() % 60; left > 0; --left) text += kCharacters[random() % std::size(kCharacters)];
    if (random() % 2 == 0) text[random() % (text.size() + 1)] = static_cast<char>(random());
    text.resize(text.size() - std::min<size_t>(text.size(), random() % 4));
    ASSERT_EQ(SlowPrefix(text), ValidUtf8Prefix(text)) << "seed 5, text " << i;
  }
}

}  // namespace
}  // namespace ferrox::test
