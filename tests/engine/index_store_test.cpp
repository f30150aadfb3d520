// Catches documents that are not found by a part of theirs, or found when they are gone or not committed.
#include <chrono>
#include <future>
#include <latch>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <tuple>

#include <gtest/gtest.h>

#include "services/kovaelasticd/store/work_limit.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"
#include "wire/folder_digest.h"

namespace ferrox::engine {
namespace {

class IndexStoreTest : public testing::Test {
 protected:
  IndexStoreTest() { Reopen(); }
  void Reopen() {
    store_.reset();
    auto store = std::make_unique<SqliteStore>(folder_ / "index.sqlite", true, PlainSchema());
    store->LimitClearing({2, 1, 1, 1, 0});
    store_ = std::move(store);
  }
  void Put(const Json::Value& document) { store_->Upsert(document["KOVAMDPath"].asString(), document); }
  void Put(const std::string& path, const std::string& text) { Put(FileDocument(path, text)); }
  std::string List(const GetRequest& request) {
    std::string listed;
    store_->Get(request, [&listed](const Json::Value& entry) { listed += entry["KOVAMDPath"].asString() + "|"; });
    return listed;
  }
  std::string ListPrefix(const std::string& prefix) { return List({"", prefix, "", -1, {}}); }
  Json::Value Load(const std::string& path, const std::vector<std::string>& fields = {}) {
    Json::Value loaded;
    store_->Get({path, "", "", -1, fields}, [&loaded](const Json::Value& entry) { loaded = entry; });
    return loaded;
  }

  test::TempDir folder_;
  std::unique_ptr<IndexStore> store_;
};

TEST_F(IndexStoreTest, OtherNamesOfAChangedFileAreSuspects) {
  const auto stamped = [](const std::string& path, const std::string& stamp) {
    Json::Value document = FileDocument(path, "text");
    document["_KOVAStamp"] = stamp;
    return document;
  };
  const auto suspects = [this] {
    GetRequest request;
    request.suspects = true;
    return List(request);
  };
  for (const char* name : {"/a", "/b", "/c"}) Put(stamped(name, "1.1.1.77"));
  Put(stamped("/other", "1.1.1.78"));
  Put(stamped("/unknown", "77"));
  Json::Value folder = stamped("/folder", "1.1.1.77");
  folder["KOVAMDIsDir"] = true;
  Put(folder);
  EXPECT_EQ("", suspects());
  Put(stamped("/b", "1.1.2.77"));
  EXPECT_EQ("/a|/c|", suspects());
  Put(stamped("/a", "1.1.3.77"));
  EXPECT_EQ("/b|/c|", suspects()) << "the file changed again meanwhile";
  Put(stamped("/b", "1.1.2.77"));
  EXPECT_EQ("/a|/c|", suspects());
  Put(stamped("/a", "1.1.3.77"));
  EXPECT_EQ("/b|/c|", suspects()) << "it was looked at before that, and written behind it";
  Put(stamped("/b", "1.1.3.77"));
  store_->Commit();
  Reopen();
  GetRequest of_file;
  of_file.file = 77;
  of_file.after = "/a";
  EXPECT_EQ("/b|/c|", List(of_file)) << "all names of the file behind the first";
  EXPECT_EQ("/c|", suspects());
  Json::Value change;
  change["KOVAMDPath"] = "/moved";
  store_->Set("/c", change);
  EXPECT_EQ("/moved|", suspects()) << "a new name says nothing of the file";
  change = Json::Value();
  change["_KOVAStamp"] = "1.1.3.77";
  store_->Set("/moved", change);
  EXPECT_EQ("", suspects());
  store_->Delete("/moved");
  EXPECT_EQ("/a|/b|", suspects());
  Put(stamped("/a", "1.1.1.79"));
  EXPECT_EQ("/b|", suspects());
  store_->Delete("/b");
  Put(stamped("/new", "1.1.1.77"));
  EXPECT_EQ("", suspects());
}

TEST_F(IndexStoreTest, OfADeletedFolderNothingIsSeenFromTheCommitOn) {
  const auto put = [this](const std::string& path, const std::string& stamp) {
    Json::Value document = FileDocument(path, "harbour boats");
    document["_KOVAStamp"] = stamp;
    document["_KOVAExtractError"] = "not text";
    Put(document);
  };
  put("/live", "1.1.1.77");
  put("/gone/1", "1.1.1.77");
  put("/gone/2", "1.1.1.78");
  put("/gone/below/3", "1.1.1.79");
  store_->Commit();
  store_->DeletePrefix("/gone/");
  EXPECT_EQ(4, Find(*store_, "harbour").total) << "not committed";
  put("/gone/2", "1.1.1.78");
  store_->Commit();
  for (bool cleared = false; !cleared; store_->ClearSome()) {
    cleared = store_->Uncleared() == 0;
    SCOPED_TRACE(store_->Uncleared());
    for (const char* query : {"harbour", "boats path:/", "size:13", "-other"}) {
      EXPECT_EQ("/gone/2\n/live", FindPaths(*store_, query)) << query;
    }
    const StoreStat stat = store_->Stat();
    EXPECT_EQ(2, stat.documents);
    EXPECT_EQ(store_->Uncleared(), stat.clearing);
    EXPECT_EQ(2, stat.extract_errors.at("not text"));
    EXPECT_EQ((std::vector<std::string>{"/live", "/gone/2"}), stat.extract_error_examples.at("not text"));
    GetRequest listed;
    listed.unread = true;
    EXPECT_EQ("/gone/2|/live|", List(listed));
    listed = {};
    listed.file = 79;
    EXPECT_EQ("", List(listed));
    listed = {};
    listed.suspects = true;
    EXPECT_EQ("/live|", List(listed));
    store_->RebuildSuggestions();
    store_->Commit();
    if (store_->Uncleared() == 1) Reopen();
  }
  EXPECT_EQ(std::vector<std::string>{"boats"}, Find(*store_, "\"baots\"").suggestions);
}

TEST_F(IndexStoreTest, DocumentsAreFoundByAllTheirParts) {
  Json::Value document =
      FileDocument("/v/s/Annual Report_2024.PDF", "Der Straßenbau in Łódź: quick brown fox. v2東京都の話");
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
  for (const char* query : {"strassenbau",
                            "LODZ",
                            "東京",
                            "v2東京",
                            "話",
                            "京",
                            "京都",
                            "report_2024",
                            "por name:2024",
                            "title:bridges",
                            "author:hopper",
                            "hopper ada",
                            "author:\"ada lovelace\"",
                            "KOVAMDAuthors:grace",
                            "year:1843",
                            "owner:1000",
                            "ext:pdf",
                            "kind:document -nothing",
                            "content:fox",
                            "title:fox",
                            "fox annual lovelace",
                            "name:\"report_2024.pdf\""}) {
    SCOPED_TRACE(query);
    EXPECT_EQ(FindPaths(*store_, query), "/v/s/Annual Report_2024.PDF");
  }
  for (const char* query : {"\"ada hopper\"", "title:annual", "fo", "secretstamp", "author:annual", "path:/v/s2 fox",
                            "path:/v/s/Ann", "ext:pd", "fox -kind:document", "京大", "v2京", "東京v2"}) {
    SCOPED_TRACE(query);
    EXPECT_EQ(FindPaths(*store_, query), "");
  }
}

TEST_F(IndexStoreTest, NamesOfAnyBytesAreKeptAndFound) {
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

TEST_F(IndexStoreTest, UpsertReplacesTheWholeDocument) {
  Json::Value first = FileDocument("/v/a.txt", "old words");
  first["KOVAMDTitle"] = "Old Title";
  Put(first);
  store_->Commit();
  Put("/v/a.txt", "");
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "old"), "");
  EXPECT_FALSE(Load("/v/a.txt").isMember("KOVAMDTitle"));
  EXPECT_EQ(store_->Stat().with_content, 0);
  EXPECT_EQ(store_->Stat().text_bytes, 0);
}

TEST_F(IndexStoreTest, SetChangesOnlyWhatItNames) {
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
  changes.clear();
  changes["KOVAMDTextContent"] = "other text";
  store_->Set("/v/a.txt", changes);
  EXPECT_EQ(Load("/v/a.txt", {"KOVAMDTextContent"})["KOVAMDTextContent"].asString(), "other text") << "uncommitted";
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "words"), "");
  EXPECT_EQ(FindPaths(*store_, "other fresh"), "/v/a.txt");
}

TEST_F(IndexStoreTest, DeletingTakesOnlyWhatIsNamed) {
  for (const char* path : {"/v/a", "/v/a/x", "/v/a/y/z", "/v/ab", "/v/a0", "/v/a\xFF"}) Put(path, "common text");
  store_->Commit();
  store_->DeletePrefix("/v/a/");
  store_->Delete("/v/ab");
  store_->Delete("/v/never-there");
  EXPECT_EQ(ListPrefix("/v/"), "/v/a|/v/a0|/v/a\xFF|");
  store_->Commit();
  EXPECT_EQ(FindPaths(*store_, "common"), "/v/a\n/v/a0\n/v/a\xFF");
}

TEST_F(IndexStoreTest, ListsArePagedInTheOrderOfPathBytes) {
  for (const char* path : {"/v/b", "/v/a", "/v/\xC3\xA9", "/v/Z", "/v/a/1"}) Put(path, "");
  EXPECT_EQ(ListPrefix("/v/"), "/v/Z|/v/a|/v/a/1|/v/b|/v/\xC3\xA9|");
  EXPECT_EQ(List({"", "/v/", "/v/a", 2, {}}), "/v/a/1|/v/b|");
  EXPECT_EQ(List({"", "/v/", "/v/a/1", 0, {}}), "");
  EXPECT_EQ(Load("/v/b", {"KOVAMDFSName", "KOVAMDTitle"}).size(), 1U);
}

TEST_F(IndexStoreTest, RollbackForgetsAndCommitLasts) {
  Put("/v/kept", "first words");
  store_->Commit();
  Put("/v/kept", "second words");
  Put("/v/gone", "second words");
  store_->Rollback();
  Put("/v/next", "third words");
  store_->Commit();
  Put("/v/uncommitted", "second words");
  Reopen();
  EXPECT_EQ(ListPrefix("/v/"), "/v/kept|/v/next|");
  EXPECT_EQ(FindPaths(*store_, "first"), "/v/kept");
  EXPECT_EQ(FindPaths(*store_, "second"), "");
  EXPECT_EQ(store_->Stat().documents, 2);
}

// Of few, the keys are fetched and sorted; of many they are not, nor are conditions checked one by one.
TEST_F(IndexStoreTest, FewAndManyDocumentsAreFilteredAndOrderedExactly) {
  const std::pair<SortKey, const char*> kOrders[] = {{SortKey::kDate, "KOVAMDFSContentChangeDate"},
                                                     {SortKey::kSize, "KOVAMDFSSize"},
                                                     {SortKey::kName, "KOVAMDFSName"}};
  for (const int count : {50, 6000}) {
    store_->DeletePrefix("/v/");
    for (int i = 0; i < count; ++i) {
      const std::string name = std::to_string(100000 + i * 7919 % count) + (i % 3 == 0 ? ".txt" : ".jpg");
      Json::Value document = FileDocument("/v/" + std::string(i % 2 == 0 ? "a/" : "b/") + name, "word", i * 7 % count);
      document["KOVAMDFSSize"] = i * 13 % count;
      Put(document);
    }
    store_->Commit();
    for (const auto& [sort, field] : kOrders) {
      for (const bool ascending : {true, false}) {
        SearchRequest request;
        request.sort = sort;
        request.ascending = ascending;
        request.offset = 10;
        request.limit = 3;
        const SearchReply reply = Find(*store_, "word", request);
        EXPECT_EQ(reply.total, count);
        ASSERT_EQ(reply.hits.size(), 3U);
        for (int i = 0; i < 3; ++i) {
          const int place = ascending ? 10 + i : count - 11 - i;
          const std::string found = reply.hits[static_cast<size_t>(i)].fields[field].asString();
          EXPECT_EQ(found.substr(0, found.find('.')), std::to_string(sort == SortKey::kName ? 100000 + place : place));
        }
      }
    }
  }
  const std::pair<const char*, int64_t> kRows[] = {{"word -ext:txt", 4000},   {"word ext:txt", 2000},
                                                   {"word kind:image", 4000}, {"word path:/v/a", 3000},
                                                   {"word -path:/v/a", 3000}, {"word size:>=1000", 5000},
                                                   {"-kind:image", 2000},     {"word date:1970-01-01", 6000},
                                                   {"-size:<5999", 1},        {"word ext:txt path:/v/b", 1000},
                                                   {"name:1059", 101}};
  for (const auto& [query, total] : kRows) EXPECT_EQ(Find(*store_, query).total, total) << query;
}

TEST_F(IndexStoreTest, NumbersOfFieldsAreFoundByRange) {
  const struct {
    const char* path;
    const char* field;
    Json::Value value;
  } kDocuments[] = {
      {"/v/short.mp3", "KOVAMDDurationSecond", 59.4},       {"/v/song.mp3", "KOVAMDDurationSecond", 200},
      {"/v/film.mkv", "KOVAMDDurationSecond", 7200.9},      {"/v/book.pdf", "KOVAMDNumberOfPages", "300"},
      {"/v/letter.pdf", "KOVAMDNumberOfPages", "2"},        {"/v/odd.pdf", "KOVAMDNumberOfPages", "2 or 3"},
      {"/v/a.jpg", "KOVAMDContentCreationDate", 981173106}, {"/v/b.jpg", "KOVAMDContentCreationDate", 1717977600},
  };
  for (const auto& row : kDocuments) {
    Json::Value document = FileDocument(row.path, "word");
    document[row.field] = row.value;
    Put(document);
  }
  store_->Delete("/v/short.mp3");
  store_->Commit();
  const std::pair<const char*, const char*> kRows[] = {
      {"duration:<10m", "/v/song.mp3"},
      {"duration:>3m", "/v/film.mkv\n/v/song.mp3"},
      {"duration:2h", "/v/film.mkv"},
      {"pages:1..2", "/v/letter.pdf"},
      {"word pages:>2", "/v/book.pdf"},
      {"ext:pdf -pages:>2", "/v/letter.pdf\n/v/odd.pdf"},
      {"taken:2001-02..2001-03", "/v/a.jpg"},
      {"taken:>2001", "/v/b.jpg"},
      {"pages:2 OR duration:2h", "/v/film.mkv\n/v/letter.pdf"},
      {"iso:>0", ""},
  };
  for (const auto& [query, paths] : kRows) EXPECT_EQ(FindPaths(*store_, query), paths) << query;
}

TEST_F(IndexStoreTest, BetterHitsComeFirst) {
  Put("/v/mentions.txt", "a long text with many words and one lonely turbine in it " + std::string(4000, '.'));
  Put("/v/about.txt", "Blades\n\nturbine turbine turbine and its blades");
  Put("/v/turbine.txt", "a drawing");
  store_->Commit();
  EXPECT_EQ(Paths(Find(*store_, "turbine"), false), "/v/turbine.txt\n/v/about.txt\n/v/mentions.txt");
}

TEST_F(IndexStoreTest, BoundedRankingSaysSoAndKeepsTheNewestAndThoseByName) {
  Put("/v/turbine.txt", "a drawing");
  Put("/v/oldest.c", "turbine turbine turbine turbine");  // code has no title
  for (int i = 10; i < 40; ++i) Put("/v/" + std::to_string(i) + ".c", "turbine");
  store_->Commit();
  SearchRequest request;
  request.limit = 1000;
  for (const size_t ranked_max : {10U, 31U, 32U}) {
    request.ranked_max = ranked_max;
    const SearchReply reply = Find(*store_, "turbine", request);
    EXPECT_EQ(reply.total, 32);
    EXPECT_EQ(reply.ranking_bounded, ranked_max < 32) << ranked_max;
    EXPECT_EQ(reply.hits.size(), std::min<size_t>(32, ranked_max + 1)) << ranked_max;
    EXPECT_EQ(reply.hits[0].path, "/v/turbine.txt");
    EXPECT_EQ(Paths(reply).find("/v/oldest.c") != std::string::npos, ranked_max > 30) << ranked_max;
  }
}

TEST_F(IndexStoreTest, ValuesOfAllTypesAreLoadedAsTheyWereStored) {
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

TEST_F(IndexStoreTest, WorkThatTakesTooLongEndsAndTheNextSearchRunsOn) {
  Put("/v/a", "word");
  store_->Commit();
  Database endless(folder_ / "endless.sqlite", Database::Mode::kCreate);
  const auto code = [](const auto& work) {
    try {
      work();
      return 0;
    } catch (const Error& error) {
      return static_cast<int>(error.Code());
    }
  };
  {
    const WorkLimit limit(std::chrono::milliseconds(1));
    WorkLimit::Apply(endless.Handle());
    EXPECT_EQ(Error::kEngineUserBusy, code([&] {
                (void)endless.QueryInt(
                    "WITH RECURSIVE n(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM n) "
                    "SELECT count(*) FROM n");
              }));
    EXPECT_EQ(Error::kEngineUserBusy, code([&] { (void)FindPaths(*store_, "word"); }));
  }
  const auto search_holding = [&](size_t bytes) {
    const WorkLimit limit(std::chrono::hours(1));
    WorkLimit::Require(bytes);
    return code([&] { (void)FindPaths(*store_, "word"); });
  };
  const size_t each = WorkLimit::MemoryOfAll() / 2;
  EXPECT_EQ(0, search_holding(each / 2));
  EXPECT_EQ(Error::kEngineUserBusy, search_holding(each - 1));
  std::latch held(2), done(1);
  const auto hold = [&] {
    const WorkLimit limit(std::chrono::hours(1));
    WorkLimit::Require(each - 1);
    held.count_down();
    done.wait();
  };
  {
    const auto one = std::async(std::launch::async, hold), two = std::async(std::launch::async, hold);
    held.wait();
    EXPECT_EQ(Error::kEngineBusyMemory, search_holding(1));
    done.count_down();
  }
  EXPECT_EQ(0, search_holding(each / 2)) << "given back";
  EXPECT_EQ("/v/a", FindPaths(*store_, "word"));
}

TEST(FolderDigestTest, TellsDocumentsApartInNameStampMarksAndOrder) {
  using Documents = std::vector<std::tuple<const char*, const char*, unsigned>>;
  std::set<uint64_t> values;
  const Documents lists[] = {{},
                             {{"", "", 0}},
                             {{"", "", 0}, {"", "", 0}},
                             {{"a", "1", 0}},
                             {{"a", "1", 1}},
                             {{"a1", "", 0}},
                             {{"", "a1", 0}},
                             {{"a", "1", 0}, {"b", "2", 0}},
                             {{"b", "2", 0}, {"a", "1", 0}},
                             {{"a", "2", 0}, {"b", "1", 0}},
                             {{"a", "1b2", 0}},
                             {{"longer than a word", "1.2.3.4", 0}},
                             {{"longer than a worD", "1.2.3.4", 0}}};
  for (const uint64_t seed : {0, 1}) {
    for (const Documents& documents : lists) {
      wire::FolderDigest digest(seed);
      for (const auto& [name, stamp, marks] : documents) digest.Add(name, stamp, marks);
      EXPECT_TRUE(values.insert(digest.Value()).second);
    }
  }
}

}  // namespace
}  // namespace ferrox::engine
