// Catches words that are cut or folded unlike in the indices that exist already.
#include "services/kovaelasticd/text/words.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "services/kovaelasticd/text/spellings.h"

namespace ferrox::engine {
namespace {

std::string Words(const std::string& text) {
  std::string words;
  WordScanner scanner(text);
  while (scanner.Next()) words += (words.empty() ? "" : " ") + std::string(scanner.Word());
  return words;
}

TEST(WordsTest, TextIsCutAndFolded) {
  const struct {
    std::string text;
    std::string words;
  } kRows[] = {
      {"", ""},
      {" .,-\n", ""},
      {"Hello, World 42!", "hello world 42"},
      {"a_b.c-d e's", "a b c d e s"},
      {"Résumé ÀÉÎÕÜ ñ Ç", "resume aeiou n c"},
      {"re\xCC\x81sume\xCC\x81", "resume"},  // accents on their own
      {"Straße Æther Œuvre Łódź Þór", "strasse aether oeuvre lodz thor"},
      {"ΑΘΗΝΑ Ἀθῆναι Σίσυφος", "αθηνα αθηναι σισυφοσ"},
      {"МОСКВА Ёлка", "москва елка"},
      {"İstanbul ISTANBUL ıstanbul", "istanbul istanbul istanbul"},
      {"Ｆｕｌｌ１２３", "full123"},
      {"caf\xE9 na\xEFve", "cafe naive"},  // Latin-1
      {"ab\xFF\xC3", "abya"},              // whatever the bytes are meant to be
      {"東京都", "東京 京都 都"},
      {"東", "東"},
      {"日本 language", "日本 本 language"},
      {"word東京x", "word 東京 京 x"},
      {"か\xE3\x82\x99く", "がく く"},                 // a kana and its sound mark
      {"\xE1\x84\x92\xE1\x85\xA1\xE1\x86\xAB", "한"},  // a syllable in parts
      {"ภาษา", "ภา าษ ษา า"},
      {"🎉party", "🎉 party"},
      {"„quoted“ 10€ a→b", "quoted 10 a b"},
      {"שָׁלוֹם", "שלום"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.text);
    EXPECT_EQ(Words(row.text), row.words);
  }
}

// Indices are cut by these foldings, so they are the same in every release: FNV-1a over each code point's class and
// folded form. See services/kovaelasticd/text/make_fold_tables.py for what to do when a newer Unicode folds
// differently.
TEST(WordsTest, EveryCharacterFoldsAsInEarlierReleases) {
  uint64_t hash = 0xCBF29CE484222325;
  const auto add = [&](unsigned char byte) { hash = (hash ^ byte) * 0x100000001B3; };
  std::string folded;
  for (uint32_t c = 0; c <= 0x10FFFF; ++c) {
    if (c >= 0xD800 && c <= 0xDFFF) continue;  // surrogates are no characters
    folded.clear();
    add(static_cast<unsigned char>(FoldTo(folded, c)));
    for (const char byte : folded) add(static_cast<unsigned char>(byte));
    add(0xFF);  // in no form
  }
  EXPECT_EQ(hash, 0x845075772088B251U);
}

TEST(WordsTest, LongWordsAreCutAtTheirBeginningAlways) {
  const std::string sixty_four(64, 'x');
  EXPECT_EQ(Words(std::string(1000, 'X') + " y"), sixty_four + " y");
  const std::string accents = Words("a" + std::string(40, '\xE9') + "é" + std::string(40, 'b'));
  EXPECT_EQ(accents.size(), 64U);
  std::string wide;
  for (int i = 0; i < 100; ++i) wide += "ж";
  EXPECT_EQ(Words(wide).size(), 64U) << "never within a character";
}

TEST(WordsTest, PlacesInTheTextAreThoseOfTheWord) {
  const std::string text = "x Résumé.東京";
  WordScanner scanner(text);
  std::string found;
  while (scanner.Next()) found += text.substr(scanner.Begin(), scanner.End() - scanner.Begin()) + "|";
  EXPECT_EQ(found, "x|Résumé|東京|京|");
}

TEST(WordsTest, TrigramsCoverTheFoldedText) {
  EXPECT_EQ(Trigrams("ab", 10).size(), 0U);
  EXPECT_EQ(Trigrams("Été.", 10), (std::vector<std::string>{"ete", "te."}));
  EXPECT_EQ(Trigrams("東京都x", 1), (std::vector<std::string>{"東京都"}));
}

TEST(SpellingsTest, WordsAreFoundAsOthersWriteThem) {
  using List = std::vector<std::string>;
  EXPECT_EQ(OtherSpellings("mueller"), (List{"muller"}));
  EXPECT_EQ(OtherSpellings("muller"), (List{"mueller"}));
  EXPECT_EQ(OtherSpellings("aarhus").front(), "arhus");
  for (const char* word : {"", "does", "queue", "neues", "b2345"}) EXPECT_EQ(OtherSpellings(word), List{}) << word;
  EXPECT_EQ(OtherSpellings("\u0627\u0644\u0643\u062A\u0627\u0628"), (List{"\u0643\u062A\u0627\u0628"}));
  EXPECT_EQ(OtherSpellings("\u05E1\u05E4\u05E8"), (List{"\u05D4\u05E1\u05E4\u05E8"}));
  EXPECT_EQ(FoldText("\uFF76\uFF9E\uFF77\uFF98"), FoldText("\u30AC\u30AD\u30EA")) << "narrow kana";
}

}  // namespace
}  // namespace ferrox::engine
