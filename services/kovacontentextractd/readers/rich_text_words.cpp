#include "services/kovacontentextractd/readers/rich_text_words.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <utility>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

namespace {

using Target = RichTextTarget;

constexpr RichTextDestination kDestinations[] = {
    {"fonttbl", Target::kFontTable},
    {"title", Target::kField, field::kKOVAMDTitle},
    {"subject", Target::kField, field::kKOVAMDDescription},
    {"author", Target::kField, field::kKOVAMDAuthors},
    {"operator", Target::kField, field::kKOVAMDContributors},
    {"keywords", Target::kField, field::kKOVAMDKeywords},
    {"category", Target::kField, field::kKOVAMDKeywords},
    {"doccomm", Target::kField, field::kKOVAMDComment},
    {"company", Target::kField, field::kKOVAMDOrganizations},
    {"generator", Target::kField, field::kKOVAMDCreator},
    {"info", Target::kNowhere},
    {"colortbl", Target::kNowhere},
    {"stylesheet", Target::kNowhere},
    {"pict", Target::kNowhere},
    {"objdata", Target::kNowhere},
    {"fldinst", Target::kNowhere},
    {"listtable", Target::kNowhere},
    {"listoverridetable", Target::kNowhere},
    {"themedata", Target::kNowhere},
    {"datastore", Target::kNowhere},
    {"xmlnstbl", Target::kNowhere},
    {"rsidtbl", Target::kNowhere},
    {"filetbl", Target::kNowhere},
    {"revtbl", Target::kNowhere},
    {"bkmkstart", Target::kNowhere},
    {"bkmkend", Target::kNowhere},
    {"shppict", Target::kText},
    {"footnote", Target::kText},
    {"annotation", Target::kText},
    {"shptxt", Target::kText},
};

/// A control word that stands for a character.
struct NamedCharacter {
  std::string_view word;
  uint32_t code;
};

constexpr NamedCharacter kCharacters[] = {
    {"par", '\n'},      {"line", '\n'},     {"row", '\n'},      {"sect", '\n'},        {"page", '\n'},
    {"cell", '\t'},     {"nestcell", '\t'}, {"tab", '\t'},      {"emdash", 0x2014},    {"endash", 0x2013},
    {"bullet", 0x2022}, {"lquote", 0x2018}, {"rquote", 0x2019}, {"ldblquote", 0x201C}, {"rdblquote", 0x201D},
    {"emspace", ' '},   {"enspace", ' '},
};

}  // namespace

const RichTextDestination* FindRichTextDestination(std::string_view word) {
  const auto* found = std::find_if(std::begin(kDestinations), std::end(kDestinations),
                                   [&](const RichTextDestination& destination) { return destination.word == word; });
  return found != std::end(kDestinations) ? found : nullptr;
}

uint32_t RichTextCharacter(std::string_view word) {
  for (const NamedCharacter& character : kCharacters) {
    if (character.word == word) return character.code;
  }
  return 0;
}

int CodePageOfCharset(int charset) {
  static constexpr std::array<std::pair<int, int>, 17> kCharsets = {{{0, 1252},
                                                                     {77, kMacRomanCodePage},
                                                                     {128, 932},
                                                                     {129, 949},
                                                                     {130, 1361},
                                                                     {134, 936},
                                                                     {136, 950},
                                                                     {161, 1253},
                                                                     {162, 1254},
                                                                     {163, 1258},
                                                                     {177, 1255},
                                                                     {178, 1256},
                                                                     {186, 1257},
                                                                     {204, 1251},
                                                                     {222, 874},
                                                                     {238, 1250},
                                                                     {255, 437}}};
  for (const auto& [number, code_page] : kCharsets) {
    if (number == charset) return code_page;
  }
  return 0;
}

}  // namespace ferrox::extract
