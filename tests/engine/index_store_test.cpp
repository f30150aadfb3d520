#include <filesystem>
#include <functional>
#include <memory>
#include <string>

#include <gtest/gtest.h>

#include "common/error.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

/// What every kind of store must do; each kind names how one is opened in a folder.
struct StoreKind {
  const char* name;
  std::function<std::unique_ptr<IndexStore>(const std::string& folder)> open;
};

class IndexStoreTest : public testing::TestWithParam<StoreKind> {
 protected:
  void SetUp() override { Reopen(); }
  void Reopen() {
    store_.reset();
    store_ = GetParam().open(folder_.Path());
  }
  void Put(const Json::Value& document) { store_->Upsert(document["KOVAMDPath"].asString(), document); }
  void Put(const std::string& path, const std::string& text) { Put(FileDocument(path, text)); }
  std::string List(const GetRequest& request) {
    std::string listed;
    store_->Get(request, [&listed](const Json::Value& entry) { listed += entry["KOVAMDPath"].asString() + "|"; });
    return listed;
  }
  std::string ListPrefix(const std::string& prefix) {
    GetRequest request;
    request.prefix = prefix;
    return List(request);
  }
  Json::Value Load(const std::string& path, const std::vector<std::string>& fields = {}) {
    GetRequest request;
    request.term = path;
    request.fields = fields;
    Json::Value loaded;
    store_->Get(request, [&loaded](const Json::Value& entry) { loaded = entry; });
    return loaded;
  }

  test::TempDir folder_;
  std::unique_ptr<IndexStore> store_;
};

TEST_P(IndexStoreTest, DocumentsAreFoundByAllTheirParts) {
  Json::Value document =
      FileDocument("/v/s/Annual Report_2024.PDF", "Der Straßenbau in Łódź: quick brown fox. 東京都の話");
  document["KOVAMDTitle"] = "On Bridges";
  document["KOVAMDAuthors"].append("Ada Lovelace");
  document["KOVAMDAuthors"].append("Grace Hopper");
  document["KOVAMDRecordingYear"] = 1843;
  document["KOVAMDOwnerUserID"] = "1000";
  document["_KOVAStamp"] = "secretstamp";
  Put(document);
  Put("/v/s/other.txt", "nothing here");
  EXPECT_EQ(FindPaths(*store_, "fox"), "") << "only what is committed is found";
  store_->Commit();
  for (const char* query : {"fox",
                            "strassenbau",
                            "LODZ",
                            "\"quick brown\"",
                            "qui*",
                            "東京",
                            "話",
                            "京都",
                            "annual",
                            "report_2024",
                            "por name:2024",
                            "nnual",
                            "bridges",
                            "title:bridges",
                            "author:hopper",
                            "hopper ada",
                            "author:\"ada lovelace\"",
                            "KOVAMDAuthors:grace",
                            "year:1843",
                            "owner:1000",
                            "ext:pdf",
                            "kind:document -nothing",
                            "path:/v/s fox",
                            "size:>20 date:2023",
                            "fox OR zebra",
                            "content:fox",
                            "fox annual lovelace",
                            "name:\"report_2024.pdf\""}) {
    SCOPED_TRACE(query);
    EXPECT_EQ(FindPaths(*store_, query), "/v/s/Annual Report_2024.PDF");
  }
  for (const char* query : {"zebra", "\"brown quick\"", "\"ada hopper\"", "title:fox", "name:fox", "-fox -nothing",
                            "fo", "secretstamp", "author:annual", "path:/v/s2 fox", "path:/v/s/Ann", "date:2022",
                            "fox zebra", "size:>1M", "ext:pd", "fox -kind:document", "京大"}) {
    SCOPED_TRACE(query);
    EXPECT_EQ(FindPaths(*store_, query), "");
  }
}

TEST_P(IndexStoreTest, NamesOfAnyBytesAreKeptAndFound) {
  const std::string names[] = {"line\nbreak.txt", "quote\"s'.txt", "caf\xE9.txt", "\xFF\xFE",
                               "東京 写真.jpg",   "\x02mark.txt",  "%_*.txt",     "tab\t.txt"};
  for (const std::string& name : names) Put("/v/s/" + name, "");
  store_->Commit();
  Reopen();
  for (const std::string& name : names) {
    const std::string path = "/v/s/" + name;
    EXPECT_EQ(Load(path)["KOVAMDFSName"].asString(), name);
    EXPECT_EQ(List({path, "", "", -1, {}}), path + "|");
  }
  EXPECT_EQ(FindPaths(*store_, "cafe"), "/v/s/caf\xE9.txt");
  EXPECT_EQ(FindPaths(*store_, "break"), "/v/s/line\nbreak.txt");
  EXPECT_EQ(FindPaths(*store_, "mark"), "/v/s/\x02mark.txt");
  EXPECT_EQ(FindPaths(*store_, "写真"), "/v/s/東京 写真.jpg");
}

TEST_P(IndexStoreTest, UpsertReplacesTheWholeDocument) {
  Json::Value first = FileDocument("/v/a.txt", "old words");
  first["KOVAMDTitle"] = "Old Title";
  Put(first);
  store_->Commit();
  Put("/v/a.txt", "new words");
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "old"), "");
  EXPECT_EQ(FindPaths(*store_, "new words"), "/v/a.txt");
  EXPECT_FALSE(Load("/v/a.txt").isMember("KOVAMDTitle"));
  Put("/v/a.txt", "");
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "words"), "");
  EXPECT_EQ(store_->Stat().with_content, 0);
  EXPECT_EQ(store_->Stat().text_bytes, 0);
}

TEST_P(IndexStoreTest, SetChangesOnlyWhatItNames) {
  Put("/v/a.txt", "some words");
  store_->Commit();
  Json::Value changes;
  changes["KOVAMDTitle"] = "Fresh";
  changes["KOVAMDFSSize"] = 99;
  changes["KOVAMDDisplayName"] = Json::nullValue;
  store_->Set("/v/a.txt", changes);
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "words title:fresh size:99"), "/v/a.txt");
  EXPECT_FALSE(Load("/v/a.txt").isMember("KOVAMDDisplayName"));
  EXPECT_EQ(Load("/v/a.txt", {"KOVAMDTextContent"})["KOVAMDTextContent"].asString(), "some words");
  changes.clear();
  changes["KOVAMDTextContent"] = "other text";
  store_->Set("/v/a.txt", changes);
  EXPECT_EQ(Load("/v/a.txt", {"KOVAMDTextContent"})["KOVAMDTextContent"].asString(), "other text") << "uncommitted";
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "words"), "");
  EXPECT_EQ(FindPaths(*store_, "other fresh"), "/v/a.txt");
  try {
    store_->Set("/v/missing", changes);
    FAIL();
  } catch (const Error& error) {
    EXPECT_EQ(error.Code(), Error::kEngineNoSuchDocument);
  }
}

TEST_P(IndexStoreTest, AMovedDocumentReplacesTheOneThere) {
  Put("/v/a.txt", "alpha");
  Put("/v/b.txt", "beta");
  store_->Commit();
  Json::Value changes;
  for (const char* name : {"KOVAMDFSName", "KOVAMDSearchFileName", "KOVAMDDisplayName"}) changes[name] = "b.txt";
  changes["KOVAMDPath"] = "/v/b.txt";
  store_->Set("/v/a.txt", changes);
  EXPECT_EQ(ListPrefix("/v/"), "/v/b.txt|");
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "alpha"), "/v/b.txt");
  EXPECT_EQ(FindPaths(*store_, "beta"), "");
  EXPECT_EQ(FindPaths(*store_, "name:a"), "");
  EXPECT_EQ(store_->Stat().documents, 1);
  Put("/v/a.txt", "a third");  // may get the number of the one that was replaced
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "third"), "/v/a.txt");
}

TEST_P(IndexStoreTest, DeletingTakesOnlyWhatIsNamed) {
  for (const char* path : {"/v/a", "/v/a/x", "/v/a/y/z", "/v/ab", "/v/a0", "/v/a\xFF"}) Put(path, "common text");
  store_->Commit();
  store_->DeletePrefix("/v/a/");
  store_->Delete("/v/ab");
  store_->Delete("/v/never-there");
  EXPECT_EQ(ListPrefix("/v/"), "/v/a|/v/a0|/v/a\xFF|");
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "common"), "/v/a\n/v/a0\n/v/a\xFF");
  Put("/v/new", "common text");
  store_->Delete("/v/new");
  store_->Commit();
  EXPECT_EQ(Find(*store_, "common").total, 3);
}

TEST_P(IndexStoreTest, ListsArePagedInTheOrderOfPathBytes) {
  for (const char* path : {"/v/b", "/v/a", "/v/\xC3\xA9", "/v/Z", "/v/a/1"}) Put(path, "");
  EXPECT_EQ(ListPrefix("/v/"), "/v/Z|/v/a|/v/a/1|/v/b|/v/\xC3\xA9|");
  EXPECT_EQ(List({"", "/v/", "/v/a", 2, {}}), "/v/a/1|/v/b|");
  EXPECT_EQ(List({"", "/v/", "/v/a/1", 0, {}}), "");
  EXPECT_EQ(Load("/v/b", {"KOVAMDFSName", "KOVAMDTitle"}).size(), 1U);
}

TEST_P(IndexStoreTest, RollbackForgetsAndCommitLasts) {
  Put("/v/kept", "first words");
  store_->Commit();
  Put("/v/kept", "second words");
  Put("/v/gone", "second words");
  store_->Rollback();
  EXPECT_EQ(ListPrefix("/v/"), "/v/kept|");
  store_->Commit();
  Put("/v/uncommitted", "second words");
  Reopen();
  EXPECT_EQ(ListPrefix("/v/"), "/v/kept|");
  EXPECT_EQ(FindPaths(*store_, "first"), "/v/kept");
  EXPECT_EQ(FindPaths(*store_, "second"), "");
  EXPECT_EQ(store_->Stat().documents, 1);
}

TEST_P(IndexStoreTest, EveryOrderAndPageIsExact) {
  for (int i = 0; i < 50; ++i) {
    Json::Value document = FileDocument("/v/f" + std::to_string(i * 37 % 50 + 100), "word");
    document["KOVAMDFSSize"] = i * 13 % 50;
    document["KOVAMDFSContentChangeDate"] = i * 7 % 50;
    Put(document);
  }
  store_->Commit();
  const struct {
    SortKey sort;
    const char* field;
  } kRows[] = {{SortKey::kDate, "KOVAMDFSContentChangeDate"},
               {SortKey::kSize, "KOVAMDFSSize"},
               {SortKey::kName, "KOVAMDFSName"}};
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.field);
    for (const bool ascending : {true, false}) {
      SearchRequest request;
      request.sort = row.sort;
      request.ascending = ascending;
      request.offset = 10;
      request.limit = 5;
      const SearchReply reply = Find(*store_, "word", request);
      EXPECT_EQ(reply.total, 50);
      ASSERT_EQ(reply.hits.size(), 5U);
      for (int i = 0; i < 5; ++i) {
        const int place = ascending ? 10 + i : 39 - i;
        const Json::Value& found = reply.hits[static_cast<size_t>(i)].fields[row.field];
        const std::string shown =
            row.sort == SortKey::kName ? "f" + std::to_string(100 + place) : std::to_string(place);
        EXPECT_EQ(found.asString(), shown);
      }
    }
  }
}

// So many that conditions are not checked one by one and keys are not fetched and sorted.
TEST_P(IndexStoreTest, ManyDocumentsAreFilteredAndOrderedExactly) {
  constexpr int kCount = 6000;
  for (int i = 0; i < kCount; ++i) {
    const std::string name = std::to_string(100000 + i * 7919 % kCount) + (i % 3 == 0 ? ".txt" : ".jpg");
    Json::Value document = FileDocument("/v/" + std::string(i % 2 == 0 ? "a/" : "b/") + name, "word");
    document["KOVAMDFSSize"] = i * 13 % kCount;
    document["KOVAMDFSContentChangeDate"] = i * 7 % kCount;
    Put(document);
  }
  store_->Commit();
  const std::pair<const char*, int64_t> kRows[] = {{"word -ext:txt", 4000},   {"word ext:txt", 2000},
                                                   {"word kind:image", 4000}, {"word path:/v/a", 3000},
                                                   {"word -path:/v/a", 3000}, {"word size:>=1000", 5000},
                                                   {"-kind:image", 2000},     {"word date:1970-01-01", 6000},
                                                   {"-size:<5999", 1},        {"word ext:txt path:/v/b", 1000},
                                                   {"name:1059", 101}};
  for (const auto& [query, total] : kRows) EXPECT_EQ(Find(*store_, query).total, total) << query;
  const std::pair<SortKey, const char*> kOrders[] = {{SortKey::kDate, "KOVAMDFSContentChangeDate"},
                                                     {SortKey::kSize, "KOVAMDFSSize"},
                                                     {SortKey::kName, "KOVAMDFSName"}};
  for (const auto& [sort, field] : kOrders) {
    for (const bool ascending : {true, false}) {
      SearchRequest request;
      request.sort = sort;
      request.ascending = ascending;
      request.offset = 100;
      request.limit = 3;
      const SearchReply reply = Find(*store_, "word", request);
      ASSERT_EQ(reply.hits.size(), 3U);
      for (int i = 0; i < 3; ++i) {
        const int place = ascending ? 100 + i : kCount - 101 - i;
        const std::string found = reply.hits[static_cast<size_t>(i)].fields[field].asString();
        EXPECT_EQ(found.substr(0, found.find('.')), std::to_string(sort == SortKey::kName ? 100000 + place : place));
      }
    }
  }
}

TEST_P(IndexStoreTest, BetterHitsComeFirst) {
  Put("/v/mentions.txt", "a long text with many words and one lonely turbine in it " + std::string(4000, '.'));
  Put("/v/about.txt", "turbine turbine turbine and its blades");
  Put("/v/turbine.txt", "a drawing");
  store_->Commit();
  EXPECT_EQ(Paths(Find(*store_, "turbine"), false), "/v/turbine.txt\n/v/about.txt\n/v/mentions.txt");
}

TEST_P(IndexStoreTest, ReasonsOfFailedExtractionAreCounted) {
  for (int i = 0; i < 3; ++i) {
    Json::Value document = FileDocument("/v/" + std::to_string(i));
    document["_KOVAExtractError"] = i == 0 ? "encrypted" : "not text";
    Put(document);
  }
  store_->Commit();
  const std::map<std::string, int64_t> expected = {{"encrypted", 1}, {"not text", 2}};
  EXPECT_EQ(store_->Stat().extract_errors, expected);
  EXPECT_EQ(Load("/v/0", {"_KOVAExtractError"})["_KOVAExtractError"].asString(), "encrypted");
}

TEST_P(IndexStoreTest, SimilarWordsAreSuggestedWhenNothingIsFound) {
  Put("/v/a", "the refrigerator hums");
  Put("/v/b", "a refrigerator again");
  store_->RebuildSuggestions();
  store_->Commit();
  EXPECT_EQ(Find(*store_, "refridgerator").suggestions, std::vector<std::string>{"refrigerator"});
  EXPECT_TRUE(Find(*store_, "refrigerator").suggestions.empty());
}

TEST_P(IndexStoreTest, ValuesOfAllTypesAreLoadedAsTheyWereStored) {
  Json::Value document = FileDocument("/v/a", "text");
  document["KOVAMDStarRating"] = "5";
  document["KOVAMDDurationSecond"] = 12.5;
  document["KOVAMDPixelCount"] = Json::Int64(-5000000000);
  document["Custom"]["nested"].append(true);
  document["Huge"] = Json::UInt64(18446744073709551615ULL);
  document["Nothing"] = Json::nullValue;
  document["KOVAMDParent"] = "/elsewhere";
  Put(document);
  store_->Commit();
  Reopen();
  document.removeMember("KOVAMDTextContent");
  EXPECT_EQ(Load("/v/a"), document);
}

INSTANTIATE_TEST_SUITE_P(Stores, IndexStoreTest,
                         testing::Values(StoreKind{"Sqlite",
                                                   [](const std::string& folder) -> std::unique_ptr<IndexStore> {
                                                     return std::make_unique<SqliteStore>(folder + "/index.sqlite",
                                                                                          true, PlainSchema());
                                                   }}),
                         [](const auto& kind) { return kind.param.name; });

}  // namespace
}  // namespace ferrox::engine
