#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

struct sb_stemmer;

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
inline constexpr size_t kLanguages = 13;  ///< with kNone

/// kNone for a number that is none of these.
inline Language LanguageOfNumber(int64_t number) {
  return number >= 0 && number < int64_t{kLanguages} ? static_cast<Language>(number) : Language::kNone;
}

/// Where a word has another stem than itself in its document's language, the full-text tables have, at the same
/// position, this mark and the stem. So a stem is one word, with a rarity of its own.
inline constexpr char kStemMark = '\x04';

/// Cuts words down to their stems, so that the forms of a word are one: "searching" and "searched". Works on folded
/// words, since a user may leave accents out: what a language's rules need of them is put back first. Remembers words,
/// most of which come again soon. For one thread at a time.
class Stemmer {
 public:
  Stemmer();
  ~Stemmer();
  Stemmer(const Stemmer&) = delete;
  Stemmer& operator=(const Stemmer&) = delete;

  /// kStemMark and the stem of a folded word, which may be the word itself; "" for words without: those of fewer than
  /// three letters, with a digit, or of another script than the language's. Valid until the next call.
  std::string_view MarkedStem(Language language, std::string_view word);

  /// Another text begins, whose words StemInText is asked for.
  void BeginText() { ++text_; }
  /// MarkedStem for the tables: "" where it is the word itself, and where the text had the same word some times before,
  /// since a further stem then tells next to nothing. Depends on the text and its language alone, so that the same
  /// stems are cut when the document goes.
  std::string_view StemInText(Language language, std::string_view word);

 private:
  struct Remembered;
  struct Deleter {
    void operator()(sb_stemmer* stemmer) const;
  };

  void Cut(Language language, std::string_view word);
  Remembered* Remember(Language language, std::string_view word);

  uint32_t text_ = 0;                                                      ///< how many have begun
  std::array<std::unique_ptr<sb_stemmer, Deleter>, kLanguages> stemmers_;  ///< made when they are first needed
  std::unique_ptr<Remembered[]> remembered_;                               ///< likewise
  std::string spelled_;                                                    ///< the word as the rules want it
  std::string stem_;                                                       ///< the last one that was cut, marked
};

/// The stems, marked, under which documents of any language may have forms of a folded word of a query; each once. A
/// document that has the bare stem for a word, and no other form of it, has it unmarked. Always those of all
/// languages: what an index holds makes no difference.
std::vector<std::string> QueryStems(std::string_view word);

}  // namespace ferrox::engine
