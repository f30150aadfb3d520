#include "services/kovaelasticd/text/language.h"

// It declares a function with FILE, without the header for that.
#include <algorithm>
#include <cld2/public/compact_lang_det.h>
#include <cstdio>
#include <optional>
#include <string>

#include "base/text.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

namespace {

/// Of a long text so many bytes of the beginning, and as many of the middle, are looked at: of the former alone may be
/// a preface or a licence in another language.
constexpr size_t kSampleBytes = 384;

struct LanguageNames {
  Language language;
  std::string_view two_letters;
  std::string_view three_letters;
  std::string_view other_three_letters;
  std::string_view english;
};
constexpr LanguageNames kLanguageNames[] = {
    {Language::kEnglish, "en", "eng", "eng", "english"}, {Language::kGerman, "de", "deu", "ger", "german"},
    {Language::kFrench, "fr", "fra", "fre", "french"},   {Language::kSpanish, "es", "spa", "spa", "spanish"},
    {Language::kItalian, "it", "ita", "ita", "italian"}, {Language::kPortuguese, "pt", "por", "por", "portuguese"},
    {Language::kDutch, "nl", "nld", "dut", "dutch"},     {Language::kSwedish, "sv", "swe", "swe", "swedish"},
    {Language::kDanish, "da", "dan", "dan", "danish"},   {Language::kNorwegian, "no", "nor", "nor", "norwegian"},
    {Language::kNorwegian, "nb", "nob", "nno", "nn"},    {Language::kFinnish, "fi", "fin", "fin", "finnish"},
    {Language::kRussian, "ru", "rus", "rus", "russian"},
};

/// Nothing for a text that names none, such as "und".
std::optional<Language> NamedLanguage(const std::string& text) {
  const std::string name = base::LowerAscii(text.substr(0, text.find_first_of("-_; ,")));
  for (const LanguageNames& names : kLanguageNames) {
    if (name == names.two_letters || name == names.three_letters || name == names.other_three_letters ||
        name == names.english)
      return names.language;
  }
  return std::nullopt;
}

std::optional<Language> StatedLanguage(const Json::Value& document) {
  const Json::Value& stated = document[field::kLanguages];
  const Json::Value& first = stated.isArray() && !stated.empty() ? stated[0] : stated;
  return first.isString() ? NamedLanguage(first.asString()) : std::nullopt;
}

/// Whole characters of `text`, about `bytes` of them from `begin` on.
std::string_view Excerpt(std::string_view text, size_t begin, size_t bytes) {
  const auto is_inside = [&](size_t at) {
    return at < text.size() && (static_cast<unsigned char>(text[at]) & 0xC0U) == 0x80;
  };
  size_t end = std::min(text.size(), begin + bytes);
  while (is_inside(begin)) ++begin;
  while (is_inside(end)) ++end;
  return text.substr(begin, end - begin);
}

/// Lists and code are easily taken for some rare language, or for none. Where all is ASCII, their words are English.
Language Detect(std::string_view text) {
  const bool is_long = text.size() > 2 * kSampleBytes;
  std::string sample(Excerpt(text, 0, is_long ? kSampleBytes : text.size()));
  if (is_long) sample.append(" ").append(Excerpt(text, text.size() / 2, kSampleBytes));
  bool is_reliable = false;
  int valid_bytes = 0;
  const CLD2::Language found =
      CLD2::DetectLanguageCheckUTF8(sample.data(), static_cast<int>(sample.size()), true, &is_reliable, &valid_bytes);
  const std::optional<Language> language = NamedLanguage(CLD2::LanguageCode(found));
  if (language.has_value()) return *language;
  const bool is_ascii = std::all_of(sample.begin(), sample.end(), [](char c) { return (c & 0x80) == 0; });
  return is_ascii ? Language::kEnglish : Language::kNone;
}

}  // namespace

Language LanguageOf(const Json::Value& document, std::string_view text) {
  const std::optional<Language> stated = StatedLanguage(document);
  if (stated.has_value()) return *stated;
  return text.empty() ? Language::kEnglish : Detect(text);
}

}  // namespace ferrox::engine
