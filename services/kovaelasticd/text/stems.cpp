#include "services/kovaelasticd/text/stems.h"

#include <libstemmer.h>

#include <algorithm>
#include <cstring>
#include <new>

#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

struct StemRules {
  const char* snowball;
  bool cyrillic;
};
/// By Language.
constexpr StemRules kStemRules[kLanguages] = {
    {nullptr, false},     {"english", false},    {"german", false}, {"french", false},  {"spanish", false},
    {"italian", false},   {"portuguese", false}, {"dutch", false},  {"swedish", false}, {"danish", false},
    {"norwegian", false}, {"finnish", false},    {"russian", true},
};

/// Endings that the rules of a language know with their accents only. Others are known without, too, or are cut the
/// same way when they have lost them.
struct FoldedEnding {
  Language language;
  std::string_view folded;
  std::string_view spelled;
};
constexpr FoldedEnding kFoldedEndings[] = {
    {Language::kFrench, "ee", "ée"},       {Language::kFrench, "ees", "ées"},
    {Language::kFrench, "iere", "ière"},   {Language::kFrench, "ieres", "ières"},
    {Language::kPortuguese, "cao", "ção"}, {Language::kPortuguese, "coes", "ções"},
    {Language::kRussian, "аи", "ай"},      {Language::kRussian, "еи", "ей"},
    {Language::kRussian, "ии", "ий"},      {Language::kRussian, "ои", "ой"},
    {Language::kRussian, "уи", "уй"},      {Language::kRussian, "ыи", "ый"},
    {Language::kRussian, "юи", "юй"},      {Language::kRussian, "яи", "яй"},
    {Language::kRussian, "иися", "ийся"},  {Language::kRussian, "еися", "ейся"},
    {Language::kRussian, "аите", "айте"},  {Language::kRussian, "уите", "уйте"},
};

constexpr size_t kShortestStemmed = 3;
/// How often a text has the stem of the same word. Part of the index format.
constexpr uint8_t kStemsInText = 4;

/// Whether a word consists of letters that the rules of Latin or Cyrillic languages are made for. Folded, the former
/// are ASCII, and the latter lie within two lead bytes of UTF-8.
bool IsStemmed(std::string_view word, bool cyrillic) {
  if (cyrillic) {
    if (word.size() < 2 * kShortestStemmed || word.size() % 2 != 0) return false;
    for (size_t i = 0; i < word.size(); i += 2) {
      if (word[i] != '\xD0' && word[i] != '\xD1') return false;
    }
    return true;
  }
  return word.size() >= kShortestStemmed &&
         std::all_of(word.begin(), word.end(), [](char c) { return c >= 'a' && c <= 'z'; });
}

const FoldedEnding* FindFoldedEnding(Language language, std::string_view word) {
  const FoldedEnding* longest = nullptr;
  for (const FoldedEnding& ending : kFoldedEndings) {
    if (ending.language != language || !word.ends_with(ending.folded)) continue;
    if (longest == nullptr || ending.folded.size() > longest->folded.size()) longest = &ending;
  }
  return longest;
}

size_t HashOf(std::string_view word) {
  size_t hash = 0;
  for (const char c : word) hash = (hash ^ static_cast<unsigned char>(c)) * 0x01000193U;
  return hash ^ (hash >> 15);
}

}  // namespace

/// A word and its stem, at the place that the word's hash gives. Longer words are rare and are cut each time.
struct Stemmer::Remembered {
  static constexpr size_t kCount = 4096;
  static constexpr size_t kBytesMax = 22;

  std::string_view Stem() const { return {stem, stem_size}; }

  Language language = Language::kNone;
  uint8_t word_size = 0;
  uint8_t stem_size = 0;
  uint8_t put = 0;    ///< how often StemInText gave the stem for a word
  uint32_t text = 0;  ///< of this text
  char word[kBytesMax];
  char stem[1 + kBytesMax];  ///< behind kStemMark
};

void Stemmer::Deleter::operator()(sb_stemmer* stemmer) const { sb_stemmer_delete(stemmer); }

Stemmer::Stemmer() = default;
Stemmer::~Stemmer() = default;

/// By Snowball's rules, into stem_.
void Stemmer::Cut(Language language, std::string_view word) {
  const auto number = static_cast<size_t>(language);
  auto& stemmer = stemmers_[number];
  if (stemmer == nullptr) stemmer.reset(sb_stemmer_new(kStemRules[number].snowball, nullptr));
  if (stemmer == nullptr) throw std::bad_alloc();
  const FoldedEnding* ending = FindFoldedEnding(language, word);
  if (ending != nullptr) {
    spelled_.assign(word.substr(0, word.size() - ending->folded.size())).append(ending->spelled);
    word = spelled_;
  }
  const auto* letters = reinterpret_cast<const sb_symbol*>(word.data());
  const sb_symbol* cut = sb_stemmer_stem(stemmer.get(), letters, static_cast<int>(word.size()));
  if (cut == nullptr) throw std::bad_alloc();
  stem_.assign(1, kStemMark);
  stem_.append(reinterpret_cast<const char*>(cut), static_cast<size_t>(sb_stemmer_length(stemmer.get())));
  if (ending != nullptr) stem_ = kStemMark + FoldText(std::string_view(stem_).substr(1));
}

/// The word's entry, made for it where another word has it; null, and the stem in stem_, for one too long for it.
Stemmer::Remembered* Stemmer::Remember(Language language, std::string_view word) {
  if (word.size() > Remembered::kBytesMax) {
    Cut(language, word);
    return nullptr;
  }
  if (remembered_ == nullptr) remembered_ = std::make_unique<Remembered[]>(Remembered::kCount);
  Remembered& at = remembered_[HashOf(word) % Remembered::kCount];
  if (at.language == language && at.word_size == word.size() && memcmp(at.word, word.data(), word.size()) == 0) {
    return &at;
  }
  Cut(language, word);
  if (stem_.size() > sizeof(at.stem)) return nullptr;
  at.language = language;
  at.word_size = static_cast<uint8_t>(word.size());
  at.stem_size = static_cast<uint8_t>(stem_.size());
  at.put = 0;
  std::copy(word.begin(), word.end(), at.word);
  std::copy(stem_.begin(), stem_.end(), at.stem);
  return &at;
}

std::string_view Stemmer::MarkedStem(Language language, std::string_view word) {
  if (language == Language::kNone || !IsStemmed(word, kStemRules[static_cast<size_t>(language)].cyrillic)) return {};
  const Remembered* const at = Remember(language, word);
  return at != nullptr ? at->Stem() : std::string_view(stem_);
}

/// Which words share an entry follows from the text, too: a word that takes the place of another counts from 0.
std::string_view Stemmer::StemInText(Language language, std::string_view word) {
  if (language == Language::kNone || !IsStemmed(word, kStemRules[static_cast<size_t>(language)].cyrillic)) return {};
  Remembered* const at = Remember(language, word);
  const std::string_view stem = at != nullptr ? at->Stem() : std::string_view(stem_);
  if (stem.substr(1) == word) return {};
  if (at == nullptr) return stem;
  if (at->text != text_) at->put = 0;
  at->text = text_;
  if (at->put == kStemsInText) return {};
  ++at->put;
  return stem;
}

std::vector<std::string> QueryStems(std::string_view word) {
  thread_local Stemmer stemmer;
  std::vector<std::string> stems;
  for (size_t language = 1; language < kLanguages; ++language) {
    const std::string_view stem = stemmer.MarkedStem(static_cast<Language>(language), word);
    if (!stem.empty() && std::find(stems.begin(), stems.end(), stem) == stems.end()) stems.emplace_back(stem);
  }
  return stems;
}

}  // namespace ferrox::engine
