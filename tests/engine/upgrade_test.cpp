// Catches what an upgrade of an older file loses, searches that fail while it goes on, files that are left half
// upgraded, and files that are touched although they are not ours to touch.
#include <zstd.h>

#include <chrono>
#include <filesystem>
#include <semaphore>
#include <thread>

#include "services/kovaelasticd/indices/index.h"
#include "services/kovaelasticd/store/index_files.h"
#include "services/kovaelasticd/store/page_checksums.h"
#include "services/kovaelasticd/store/store_format.h"
#include "tests/engine/engine_fixture.h"
#include "tests/engine/store_helpers.h"

namespace ferrox::engine {
namespace {

namespace fs = std::filesystem;
using std::chrono::milliseconds;

/// An index in a folder of its own, as an engine of format 2 has written it.
class UpgradeTest : public EngineTest {
 protected:
  UpgradeTest() { PutKept("a"); }
  static std::string Unpacked(const std::string& name) {
    const std::string packed = test::ReadFile(FERROX_TEST_DATA "/" + name);
    std::string content(ZSTD_getFrameContentSize(packed.data(), packed.size()), '\0');
    EXPECT_EQ(content.size(), ZSTD_decompress(content.data(), content.size(), packed.data(), packed.size()));
    return content;
  }
  void PutKept(const std::string& name) const {
    fs::create_directories(folder_ / name);
    test::WriteFile(IndexFile(folder_ / name), kept_);
  }
  std::unique_ptr<Index> Open(UpgradeOptions options, milliseconds retry_after = milliseconds(1)) {
    return std::make_unique<Index>(
        nullptr, MarkerFile(folder_ / "a"), Index::kAutoCommitAfter, [] { ADD_FAILURE() << "damage"; }, nullptr,
        std::make_unique<IndexUpgrade>(file_, NoPaths(), std::move(options), retry_after));
  }
  static std::shared_ptr<Schema> NoPaths() {
    Json::Value mappings;
    for (const char* name : {"KOVAMDPath", "KOVAMDParent"}) mappings["properties"][name]["_all"] = false;
    return std::make_shared<Schema>(mappings);
  }
  /// What a good number of queries find, with snippets. Scores are others once texts have titles.
  template <typename Searched>
  static std::string Answers(Searched& index) {
    std::string answers;
    for (const char* text :
         {"boats", "harbour OR notes", "name:photo", "bo*", "-boats", "kind:folder", "path:/v/photo",
          "boats path:/v/photo/2023", "path:/", "path:/v/photo/notes.txt", "ext:txt boats", "\"boat\""}) {
      const QueryNode query = ParseQuery(text, 1718000000);
      SearchRequest request;
      request.query = &query;
      request.sort = SortKey::kName;
      for (const SearchHit& hit : index.Search(request).hits)
        answers += hit.path + " " + hit.snippet + toString(hit.fields) + "\n";
      answers += std::string("= ") + text + "\n";
    }
    return answers;
  }
  static void AwaitEnd(Index& index) {
    while (index.Upgrading().has_value()) std::this_thread::sleep_for(milliseconds(1));
  }

  const std::string kept_ = Unpacked("index_format_2.sqlite.zst");
  const std::string file_ = IndexFile(folder_ / "a");
};

TEST_F(UpgradeTest, OrdinaryUsersAreToldToWaitUntilTheRightsAreRecorded) {
  engine_.reset();
  engine_ = std::make_unique<Engine>(folder_ / "state", [](const Asker&, const std::vector<std::string>& paths) {
    return std::vector<wire::LiveFile>(paths.size(), {true, true, true, ""});
  });
  ASSERT_EQ(Create("a", "a"), 0);
  ASSERT_EQ(Code("index_share", R"({"id":"a","share":"photo","root":"/v/photo"})"), 0);
  const char* const search = R"({"command":"search","data":{"query":"boats","shares":["photo"]}})";
  while (Send("index_stat", R"({"id":"a"})")["data"].isMember("upgrading")) {
    const int code = CodeOf(SendText(search, 54321));
    EXPECT_EQ(code, 1412);
  }
  const Json::Value reply = SendText(search, 54321);
  EXPECT_EQ(reply["error"]["msg"], "the index of this share is being prepared, 0 %") << toString(reply);
  EXPECT_EQ(Code("index_prepared", R"({"id":"a"})"), 0);
  EXPECT_EQ(SendText(search, 54321)["data"]["total"], 0) << "what has no access record is closed";
}

TEST_F(UpgradeTest, AFileOfFormat2AnswersAsBefore) {
  UpgradeOptions options;
  options.turn_bytes = 1;
  int64_t last = 0;
  options.on_turn = [&last](int64_t done, int64_t /*of*/) { last = done; };
  auto old = std::make_unique<IndexUpgrade>(file_, NoPaths());
  const std::string before = Answers(*old);
  EXPECT_NE(before.find("harbour"), std::string::npos);
  WriteUpgraded(file_, NoPaths(), options);
  EXPECT_EQ(last, 7);
  EXPECT_EQ(kept_, test::ReadFile(file_)) << "the old file is only read";
  old.reset();
  ReplaceByUpgraded(file_);
  EXPECT_EQ(test::ReadFile(file_)[20], kChecksumBytes);
  SqliteStore store(file_, false, NoPaths());
  EXPECT_EQ(before, Answers(store));
  std::string listed;
  const auto list = [&listed](const Json::Value& entry) {
    listed += entry["KOVAMDPath"].asString() + "|";
    EXPECT_EQ(entry["KOVAMDPath"].asString(),
              entry["KOVAMDParent"].asString() + "/" + entry["KOVAMDFSName"].asString());
  };
  store.Get({"", "/v/", "", -1, {}}, list);
  EXPECT_EQ(listed,
            "/v/other/deep/er/x.txt|/v/photo|/v/photo-list.txt|/v/photo/2023|/v/photo/2023/b|"
            "/v/photo/2023/harbour.txt|/v/photo/notes.txt|");
  listed.clear();
  GetRequest suspects;
  suspects.suspects = true;
  store.Get(suspects, list);
  EXPECT_EQ(listed, "/v/photo/2023/harbour.txt|") << "the file's other name has changed";
  const StoreStat stat = store.Stat();
  EXPECT_EQ(stat.extract_error_examples.at("not text"), std::vector<std::string>{"/v/photo/notes.txt"});
  EXPECT_EQ(stat.without_access, 7);
  EXPECT_TRUE(stat.preparing);
  store.EndPreparing();
  store.Delete("/v/photo/2023/harbour.txt");
  Json::Value moved;
  moved["KOVAMDPath"] = "/v/pictures";
  store.MoveFolder("/v/photo", "", moved);
  store.Commit();
  EXPECT_EQ(FindPaths(store, "boats path:/v/pictures"), "/v/pictures/2023/b\n/v/pictures/notes.txt");
  EXPECT_EQ(FindPaths(store, "harbour"), "") << "its words could be taken out";
  EXPECT_FALSE(store.Stat().preparing || store.Preparing()) << "the index daemon has said so";
}

TEST_F(UpgradeTest, AFileOfFormat3WithAccessRecordsAndFromBeforeThemGetsStems) {
  for (const bool has_access : {true, false}) {
    SCOPED_TRACE(has_access);
    test::WriteFile(file_, Unpacked("index_format_3.sqlite.zst"));
    if (!has_access) {
      Database database(file_, Database::Mode::kWrite);
      for (const char* table : {"docs", "folders"})
        database.Execute("ALTER TABLE " + std::string(table) + " DROP COLUMN access");
      database.Execute("DROP TABLE access; DELETE FROM info WHERE key IN ('without_access', 'preparing')");
    }
    EXPECT_NE(Answers(*std::make_unique<IndexUpgrade>(file_, PlainSchema())).find("/v/en.txt"), std::string::npos);
    WriteUpgraded(file_, PlainSchema(), {});
    ReplaceByUpgraded(file_);
    SqliteStore store(file_, false, PlainSchema());
    EXPECT_EQ(store.Stat().without_access, has_access ? 0 : 3);
    EXPECT_EQ(store.Preparing(), !has_access);
    EXPECT_EQ(Find(store, "boats").hits.front().title, "Harbours of the north");
    EXPECT_EQ(FindPaths(store, "title:north"), "/v/en.txt");
    const std::string terms = TermsIn(file_, "content_fts") + TermsIn(file_, "meta_fts");
    for (const char* stem : {"\x04rechnung ",
                             "\x04"
                             "boat ",
                             "\x04photo "})
      EXPECT_NE(terms.find(stem), std::string::npos) << stem;
    EXPECT_EQ(store.SetAccess({{"/v/en.txt", "1.1.1.1", "0:0:0644"}}).differing.size(), 1U) << "it has no stamp";
    store.Commit();
  }
}

TEST_F(UpgradeTest, SearchesGoOnAndChangesWaitWhileAKillOrAFailureLeavesTheOldFile) {
  std::counting_semaphore<1000> turns(0);
  std::atomic<int> reached{0};
  UpgradeOptions options;
  options.turn_bytes = 1;
  options.on_turn = [&](int64_t, int64_t) {
    turns.acquire();
    if (++reached == 3) throw Error(Error::kEngineStorage, "something happened");
  };
  std::unique_ptr<Index> index = Open(options);
  const std::string before = Answers(*index);
  const auto write = [&] {
    try {
      index->Write([](IndexStore& store) { store.Upsert("/v/new.txt", FileDocument("/v/new.txt", "boats")); });
      index->Commit();
      return std::string("done");
    } catch (const Error& error) {
      EXPECT_EQ(error.Code(), Error::kEngineIndexUpgrading);
      return std::string(error.what());
    }
  };
  EXPECT_EQ(write(), "the index is being upgraded, 0 %");
  turns.release(3);
  while (reached < 3 || index->Upgrading()->problem.empty()) std::this_thread::yield();
  EXPECT_EQ(write(), "something happened");
  turns.release(20);  // it is tried again
  while (reached < 23 || !index->Upgrading()->problem.empty()) std::this_thread::yield();
  EXPECT_EQ(index->Upgrading()->of, 7);
  EXPECT_EQ(before, Answers(*index));
  EXPECT_EQ(index->Stat().documents, 7);
  fs::copy(folder_ / "a", folder_ / "killed");
  EXPECT_TRUE(fs::exists(UpgradeFile(IndexFile(folder_ / "killed"))));
  turns.release(900);
  AwaitEnd(*index);
  EXPECT_EQ(before, Answers(*index));
  EXPECT_EQ(write(), "done");
  EXPECT_EQ(index->Stat().documents, 8);
  EXPECT_FALSE(fs::exists(UpgradeFile(file_)));

  // The registry's way, from what the kill left; its mappings make words of folders' names plain.
  ASSERT_EQ(Create("killed", "killed"), 0);
  while (Send("index_list")["data"][0].isMember("upgrading")) std::this_thread::sleep_for(milliseconds(1));
  EXPECT_EQ(Total("boats", "killed"), 4);
  EXPECT_EQ(Put("killed", "/v/new.txt", "boats") + Commit("killed"), 0);
  EXPECT_EQ(Total("boats", "killed"), 5);
  EXPECT_FALSE(fs::exists(UpgradeFile(IndexFile(folder_ / "killed"))));
}

TEST_F(UpgradeTest, AFullVolumeIsToldWithWhatIsNeededAndAnEndLeavesNothingBehind) {
  UpgradeOptions options;
  options.pages_max = 20;
  std::unique_ptr<Index> index = Open(options, std::chrono::hours(1));
  while (index->Upgrading()->problem.empty()) std::this_thread::yield();
  const std::string problem = index->Upgrading()->problem;
  EXPECT_NE(problem.find(" takes 1 MiB beside it"), std::string::npos) << problem;
  EXPECT_NE(problem.find("'fileindexctl rebuild'"), std::string::npos);
  EXPECT_FALSE(fs::exists(UpgradeFile(file_)));
  EXPECT_NE(Answers(*index).find("harbour"), std::string::npos);
  index.reset();
  EXPECT_EQ(kept_, test::ReadFile(file_));

  options = {};
  options.turn_bytes = 1;
  options.on_turn = [](int64_t, int64_t) { std::this_thread::sleep_for(milliseconds(200)); };
  index = Open(options);
  while (index->Upgrading()->of == 0) std::this_thread::yield();
  index.reset();
  EXPECT_EQ(kept_, test::ReadFile(file_));
  EXPECT_FALSE(fs::exists(UpgradeFile(file_)));
}

TEST_F(UpgradeTest, ADamagedOldFileIsSetAsideAndMadeAnew) {
  Database(file_, Database::Mode::kWrite).Execute("PRAGMA journal_mode = DELETE");
  const int64_t root =
      Database(file_, Database::Mode::kRead).QueryInt("SELECT rootpage FROM sqlite_master WHERE name = 'bodies'");
  std::string content = test::ReadFile(file_);
  content.replace(static_cast<size_t>(root - 1) * 8192, 100, 100, 'x');
  test::WriteFile(file_, content);
  ASSERT_EQ(Create("a", "a"), 0);
  while (!Send("index_list")["data"][0].isMember("rebuilding")) std::this_thread::sleep_for(milliseconds(1));
  EXPECT_EQ(Put("a", "/v/new.txt", "boats") + Commit("a"), 0);
  EXPECT_EQ(Total("boats", "a"), 1);
  EXPECT_FALSE(fs::exists(UpgradeFile(file_)));
}

TEST_F(UpgradeTest, AFileOfANewerFormatIsRefusedAndLeftAsItIsWithItsLog) {
  const std::string newer = IndexFile(folder_ / "newer");
  fs::create_directories(folder_ / "newer");
  {
    const SqliteStore store(folder_ / "index.sqlite", true, PlainSchema());
    Database(folder_ / "index.sqlite", Database::Mode::kWrite).Execute("PRAGMA user_version = 99");
    for (const char* suffix : {"", "-wal"}) fs::copy_file(folder_ / "index.sqlite" + suffix, newer + suffix);
  }
  const auto content = [&] { return test::ReadFile(newer) + test::ReadFile(newer + "-wal"); };
  const std::string before = content();
  for (int i = 0; i < 2; ++i) {
    const Json::Value reply = Send("index_create", R"({"id":"newer","path":")" + (folder_ / "newer") + "\"}");
    EXPECT_EQ(CodeOf(reply), Error::kEngineStorage);
    EXPECT_NE(reply["error"]["msg"].asString().find("format 99"), std::string::npos);
  }
  EXPECT_EQ(before, content());
}

}  // namespace
}  // namespace ferrox::engine
