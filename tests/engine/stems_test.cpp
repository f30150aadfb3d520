// Catches forms of a word that do not meet, languages that are mistaken, and words of a document that stay in the index
// when it goes.
#include "services/kovaelasticd/text/stems.h"

#include <filesystem>

#include <gtest/gtest.h>

#include "services/kovaelasticd/text/fold.h"
#include "services/kovaelasticd/text/language.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

constexpr struct {
  Language language;
  const char* forms[4];  ///< of one word
  const char* text;
} kLanguagesRows[] = {
    {Language::kEnglish,
     {"license", "licenses", "licensed", "licensing"},
     "The boats were lying in the harbour before the storm."},
    {Language::kGerman,
     {"Kündigung", "Kündigungen", "kundigung", "Kündigungen"},
     "Alle Rechnungen müssen innerhalb von vierzehn Tagen bezahlt werden."},
    {Language::kFrench,
     {"créées", "créée", "creer", "créé"},
     "Les factures doivent être payées avant la fin de ce mois."},
    {Language::kSpanish,
     {"canción", "canciones", "cancion", "CANCIONES"},
     "Todas las facturas deben pagarse antes del final de este mes."},
    {Language::kItalian,
     {"fattura", "fatture", "FATTURE", "fattura"},
     "Tutte le fatture devono essere pagate entro la fine del mese."},
    {Language::kPortuguese,
     {"informação", "informações", "informacao", "informacoes"},
     "Todas as faturas devem ser pagas até ao fim deste mês, não depois."},
    {Language::kDutch,
     {"bestand", "bestanden", "Bestanden", "bestand"},
     "Alle rekeningen moeten voor het einde van de maand worden betaald."},
    {Language::kSwedish,
     {"räkning", "räkningar", "räkningen", "rakningarna"},
     "Alla räkningar måste betalas före slutet av den här månaden."},
    {Language::kDanish,
     {"regning", "regninger", "regningerne", "regningen"},
     "Alle regninger skal betales inden udgangen af denne måned, ikke efter."},
    {Language::kNorwegian,
     {"regning", "regninger", "regningene", "regningen"},
     "Alle regninger må betales innen utgangen av denne måneden, ikke etter."},
    {Language::kFinnish,
     {"talo", "talossa", "talon", "talosta"},
     "Kaikki laskut on maksettava ennen tämän kuukauden loppua."},
    {Language::kRussian,
     {"красный", "красного", "красныи", "красному"},
     "Все счета должны быть оплачены до конца этого месяца."},
};

TEST(StemsTest, FormsOfAWordMeetInTheirLanguageWithAndWithoutAccents) {
  Stemmer stemmer;
  for (const auto& row : kLanguagesRows) {
    const std::string stem(stemmer.MarkedStem(row.language, FoldText(row.forms[0])));
    EXPECT_EQ(stem.substr(0, 1), std::string(1, kStemMark)) << row.forms[0];
    for (const char* form : row.forms) {
      for (int again = 0; again < 2; ++again) {
        EXPECT_EQ(stemmer.MarkedStem(row.language, FoldText(form)), stem) << form;
      }
      const std::vector<std::string> stems = QueryStems(FoldText(form));
      EXPECT_EQ(std::count(stems.begin(), stems.end(), stem), 1) << form;
    }
    EXPECT_EQ(LanguageOf(Json::Value(), row.text), row.language) << row.text;
  }
  for (const char* word : {"ab", "mp3s", "東京", "καρτες"}) EXPECT_TRUE(QueryStems(word).empty()) << word;
  const std::string word = "antidisestablishmentarianisms";
  EXPECT_EQ(stemmer.MarkedStem(Language::kEnglish, word), kStemMark + word.substr(0, word.size() - 4)) << "not kept";
}

TEST(StemsTest, WhatADocumentSaysOfItsLanguageComesFirstAndCodeIsEnglish) {
  Json::Value document;
  for (const char* stated : {"de-DE", "deu", "German", "DE"}) {
    document["KOVAMDLanguages"] = stated;
    EXPECT_EQ(LanguageOf(document, kLanguagesRows[0].text), Language::kGerman) << stated;
  }
  document["KOVAMDLanguages"] = Json::Value(Json::arrayValue);
  document["KOVAMDLanguages"].append("fi");
  EXPECT_EQ(LanguageOf(document, ""), Language::kFinnish);
  document["KOVAMDLanguages"] = "und";
  EXPECT_EQ(LanguageOf(document, ""), Language::kEnglish);
  EXPECT_EQ(LanguageOf(Json::Value(), "{ 0x4f, x1 };"), Language::kEnglish);
  EXPECT_EQ(LanguageOf(Json::Value(), "東京都は日本の首都である。"), Language::kNone);
  EXPECT_EQ(LanguageOf(Json::Value(), "Wszystkie rachunki należy zapłacić przed końcem tego miesiąca."),
            Language::kNone);
}

TEST(StemsTest, WordsOfDocumentsGoAsTheyCameWhateverChanged) {
  const test::TempDir folder;
  const std::string file = folder / "index.sqlite";
  const auto terms = [&file] {
    return TermsIn(file, "content_fts", "term||doc||col||offset", "instance") + "|" +
           TermsIn(file, "meta_fts", "term||doc||col||offset", "instance");
  };
  SqliteStore store(file, true, PlainSchema());
  store.Upsert("/a", FileDocument("/a", "quiet"));
  store.Commit();
  const std::string before = terms();
  for (const auto& row : kLanguagesRows) {
    store.Upsert("/b/x files.txt", FileDocument("/b/x files.txt", row.text));
    store.Commit();
    Json::Value change;
    change["KOVAMDLanguages"] = "fr";
    store.Set("/b/x files.txt", change);
    if (row.language != Language::kGerman) store.Commit();
    change["KOVAMDLanguages"] = Json::Value();
    change["KOVAMDTextContent"] = std::string("\x01\x02 marks ") + row.text;
    change["KOVAMDPath"] = "/b/y";
    store.Set("/b/x files.txt", change);
    store.Commit();
    EXPECT_NE(terms(), before);
    store.Delete("/b/y");
    store.Commit();
    EXPECT_EQ(terms(), before) << row.text;
  }
}

}  // namespace
}  // namespace ferrox::engine
