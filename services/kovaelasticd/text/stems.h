#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

/// A language whose words are stemmed. Stored with documents: the numbers never change.
enum class Language : uint8_t {
  kNone = 0,
  kEnglish = 1,
  kGerman = 2,
  kFrench = 3,
  kSpanish = 4,
  kItalian = 5,
  kPortuguese = 6,
  kDutch = 7,
  kSwedish = 8,
  kDanish = 9,
  kNorwegian = 10,
  kFinnish = 11,
  kRussian = 12,
};

/// Where a word has another stem than itself in its document's language, the full-text tables have, at the same
/// position, this mark and the stem. So a stem is one word, with a rarity of its own.
inline constexpr char kStemMark = '\x04';

/// The stems, marked, under which documents of any language may have forms of a folded word of a query; each once.
std::vector<std::string> QueryStems(std::string_view word);

}  // namespace ferrox::engine
