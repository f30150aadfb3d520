#include "services/kovaelasticd/search/repair.h"

#include <functional>
#include <random>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "services/kovaelasticd/search/complete.h"
#include "services/kovaelasticd/store/sqlite_store.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

class RepairTest : public testing::Test {
 protected:
  void InSnapshot(const std::function<void(StoreReader&, const Visible&)>& use) {
    auto reader = pool_.Borrow();
    reader->database.Execute("BEGIN");
    reader->Refresh();
    use(*reader, Visible(*reader, nullptr));
    reader->database.Execute("COMMIT");
    pool_.Return(std::move(reader));
  }
  std::string Repaired(const std::string& word, int64_t documents = 0) {
    std::string repaired;
    InSnapshot([&](StoreReader& reader, const Visible& visible) {
      for (const Repair& repair : RepairWords(reader, visible, {{word, documents}}))
        repaired += (repaired.empty() ? "" : " ") + repair.word;
    });
    return repaired;
  }
  void Put(const std::string& name, const std::string& text) { store_.Upsert(name, FileDocument(name, text)); }

  test::TempDir folder_;
  SqliteStore store_{folder_ / "index.sqlite", true, PlainSchema()};
  ReaderPool pool_{folder_ / "index.sqlite"};
};

TEST_F(RepairTest, WordsOfDocumentsAreFoundForTypos) {
  for (int i = 0; i < 30; ++i) Put("/v/common" + std::to_string(i), "license directory terminal");
  Put("/v/a", "lisence prints print printers straße выключатель sha256sum");
  Put("/v/b", "prints printers licensee выключатель");
  store_.Commit();
  const std::pair<const char*, const char*> cases[] = {
      {"lincense", "license"},        // a letter more; "lisence" has two errors
      {"licnese", "license"},         // swapped
      {"dicretori", ""},              // three errors
      {"dirctroy", ""},               // two errors in eight letters
      {"direcotri", "directory"},     // two errors in nine
      {"virectory", "directory"},     // a wrong first letter is two
      {"zicense", ""},                // too much for seven letters
      {"prins", "prints"},            // "print" stands in one document only
      {"term1nal", ""},               // a digit
      {"lice", ""},                   // too short
      {"выключателт", "выключатель"}  // by letters, not bytes
  };
  for (const auto& [typed, meant] : cases) EXPECT_EQ(meant, Repaired(typed)) << typed;
  EXPECT_EQ("license", Repaired("lisense", 1));
  EXPECT_EQ("", Repaired("printer", 1));  // two documents are not many more than one
}

TEST_F(RepairTest, BeginningsBecomeWordsOfNamesThenOfTexts) {
  for (int i = 0; i < 3; ++i) Put("/v/report " + std::to_string(i), "Notes\n\nreporter reporter repository");
  Put("/v/reply", "Notes\n\nreport reptile");
  Put("/v/other", "Notes\n\nreporter rep");
  store_.Commit();
  const auto complete = [&](const std::string& begin) {
    std::string words;
    InSnapshot([&](StoreReader& reader, const Visible& visible) {
      for (const Completion& completion : CompleteWord(reader, visible, begin, 3))
        words += completion.word + ":" + std::to_string(completion.documents) + " ";
    });
    return words;
  };
  EXPECT_EQ("report:3 reporter:4 repository:3 ", complete("rep"));
  EXPECT_EQ("report:3 reply:1 ", complete("re"));
  EXPECT_EQ("reporter:4 ", complete("report"));
  EXPECT_EQ("", complete("r"));
}

/// As segments are merged, numbered anew and shortened, no word must be overlooked.
TEST_F(RepairTest, AllWordsAreKnownAfterEachCommit) {
  std::mt19937 random(7);  // NOLINT(cert-msc51-cpp): the same words each time
  std::vector<std::set<std::string>> words_of;
  for (size_t round = 0; round < 12; ++round) {
    std::set<std::string>& fresh = words_of.emplace_back();
    for (int i = 0; i < 1500; ++i) {
      std::string word;
      for (int n = 0; n < 7; ++n) word += static_cast<char>('a' + random() % 26);
      fresh.insert(word);
    }
    std::string text;
    for (const std::string& word : fresh) text += word + " ";
    Put("/v/" + std::to_string(round), text);
    if (round % 5 == 4) {
      store_.Delete("/v/" + std::to_string(round - 3));
      words_of[round - 3].clear();
    }
    store_.Commit();
    InSnapshot([&](StoreReader& reader, const Visible& visible) {
      const auto known = reader.words.Load(reader.database, visible.Version());
      ASSERT_NE(nullptr, known);
      std::set<std::string, std::less<>> all;
      known->ForEachLike("", 7, 7, 32, [&](std::string_view word, bool) { all.emplace(word); });
      size_t missing = 0;
      for (const auto& words : words_of) {
        for (const std::string& word : words) missing += 1 - all.count(word);
      }
      EXPECT_EQ(0u, missing) << round;
    });
  }
}

}  // namespace
}  // namespace ferrox::engine
