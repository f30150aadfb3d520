// Catches marks in the wrong place, and bytes of a text that reach a terminal through its snippet.
#include "services/kovaelasticd/text/snippet.h"

#include <string>

#include <gtest/gtest.h>

namespace ferrox::engine {
namespace {

std::string Snippet(const std::string& text, const std::vector<SnippetWord>& words) {
  return MakeSnippet(text, words, "[", "]");
}

TEST(SnippetTest, WordsAreMarkedAsTheyStand) {
  EXPECT_EQ(Snippet("The Résumé of a café.", {{"resume", false}, {"cafe", false}}), "The [Résumé] of a [café].");
  EXPECT_EQ(Snippet("reports are reported", {{"report", true}}), "[reports] are [reported]");
  EXPECT_EQ(Snippet("東京都です", {{"東京", false}, {"京都", false}}), "[東京都]です");
  EXPECT_EQ(Snippet("nothing of it", {{"else", false}}), "");
}

TEST(SnippetTest, ControlCharactersAndForeignBytesAreHarmless) {
  EXPECT_EQ(Snippet("a\xD8\x9C\xE2\x80\x8F fox\xE2\x80\xA8z", {{"fox", false}}), "a [fox] z");
  EXPECT_EQ(Snippet("a\x1B[31m\n\t\x01 fox\x07 caf\xE9\x00z", {{"fox", false}}), "a [31m [fox] caf\xEF\xBF\xBD");
  EXPECT_EQ(Snippet("fox \xE2\x80\xAEgpj.exe \xC2\x9Bx", {{"fox", false}}), "[fox] gpj.exe x");
}

TEST(SnippetTest, ThePlaceWithTheMostWordsIsShown) {
  const std::string filler(3000, '.');
  const std::string text = "apple alone " + filler + " pear alone " + filler + " apple beside pear here " + filler;
  const std::string snippet = Snippet(text, {{"apple", false}, {"pear", false}});
  EXPECT_NE(snippet.find("[apple] beside [pear] here"), std::string::npos) << snippet;
  EXPECT_LT(snippet.size(), 400U);
  EXPECT_EQ(snippet.rfind("\xE2\x80\xA6"), snippet.size() - 3) << "what is left out is shown";
}

TEST(SnippetTest, TwoPassagesShowWhatOneHasNot) {
  const std::string filler(1000, '.');
  const std::string text = "red fox " + filler + " red red hound and more " + filler + " red hound barn " + filler;
  const std::string snippet = Snippet(text, {{"fox"}, {"hound"}, {"red"}});
  EXPECT_EQ(snippet.find("[red] [fox]"), 0U) << snippet;
  EXPECT_NE(snippet.find("[red] [hound]"), std::string::npos) << snippet;
  EXPECT_LT(snippet.size(), 330U);
  EXPECT_NE(Snippet(text, {{"fox", false, 0.1}, {"barn", false, 5}}).find("[barn]"), std::string::npos);
}

TEST(SnippetTest, StemsAreMarkedAndTheTitleIsSecondChoice) {
  const std::string text = "Licenses\n" + std::string(500, '.') + " a license in the text, licence";
  const auto english = [&](const char* word) {
    return MakeSnippet(text, {{word}}, "[", "]", {Language::kEnglish, "Licenses"});
  };
  EXPECT_NE(english("licenses").find("a [license] in"), std::string::npos) << english("licenses");
  EXPECT_EQ(english("licence").find("[license]"), std::string::npos) << "another word";
  EXPECT_EQ(Snippet(text, {{"licensing"}}), "") << "of no language that is known";
}

TEST(SnippetTest, MarksComeInPairsForAnyBytes) {
  uint32_t state = 99;
  for (int round = 0; round < 2000; ++round) {
    std::string text;
    for (int i = 0; i < 300; ++i) {
      state = state * 1664525 + 1013904223;
      text += (state >> 28) == 0 ? std::string(" fox ") : std::string(1, static_cast<char>(state >> 24));
    }
    const std::string snippet = MakeSnippet(text, {{"fox", false}}, "\x01", "\x02");
    EXPECT_EQ(std::count(snippet.begin(), snippet.end(), '\x01'), std::count(snippet.begin(), snippet.end(), '\x02'));
    for (const char c : snippet) ASSERT_TRUE(static_cast<unsigned char>(c) >= 0x20 || c == '\x01' || c == '\x02');
  }
}

}  // namespace
}  // namespace ferrox::engine
