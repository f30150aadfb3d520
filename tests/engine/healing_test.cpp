// What becomes of an index whose file is damaged or gone.

#include <sys/stat.h>

#include <functional>
#include <thread>
#include <vector>

#include "common/error.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "tests/engine/engine_fixture.h"
#include "tests/support/fake_clock.h"

namespace ferrox::engine {
namespace {

namespace fs = std::filesystem;

class HealingTest : public EngineTest {
 protected:
  ~HealingTest() override { engine_.reset(); }  // its threads ask the clock
  void SetUp() override {
    ASSERT_EQ(Create("a", "a"), 0);
    Fill();
    Restart();
  }
  void Fill() {
    for (int i = 0; i < 100; ++i) {
      std::string text = "lantern";
      for (int word = 0; word < 100; ++word) text += " w" + std::to_string(i * 7919 + word * 104729);
      ASSERT_EQ(Put("a", "/v/" + std::to_string(i), text), 0);
    }
    ASSERT_EQ(Commit("a"), 0);
  }
  /// Null for a complete index.
  Json::Value Rebuilding() { return Send("index_list", R"({"figures":false})")["data"][0]["rebuilding"]; }
  Json::Value Search() { return Send("search", R"({"query":"lantern"})")["data"]; }
  std::string Refusal() { return Send("commit", R"({"id":"a"})")["error"]["msg"].asString(); }
  std::vector<fs::path> SetAside() {
    std::vector<fs::path> found;
    for (const auto& entry : fs::directory_iterator(folder_ / "a")) {
      if (entry.path().string().find(".damaged-") != std::string::npos) found.push_back(entry.path());
    }
    return found;
  }
  /// When the file was last read as a whole, or made; 0: not noted yet.
  int64_t Scrubbed() {
    return Database(file_, Database::Mode::kRead).QueryInt("SELECT value FROM info WHERE key = 'scrubbed'");
  }
  /// What it does with each page of the file.
  void ChangePages(const std::function<void(std::string& page)>& change) {
    const std::string content = test::ReadFile(file_);
    std::string changed;
    for (size_t at = 0; at < content.size(); at += 8192) {
      std::string page = content.substr(at, 8192);
      change(page);
      changed += page;
    }
    test::WriteFile(file_, changed);
  }
  void WriteGarbage() {
    engine_.reset();
    test::WriteFile(file_, std::string(100000, 'x'));
    Restart();
  }

  const std::string file_ = folder_ / "a/index.sqlite";
  test::FakeClock clock_;
};

TEST_F(HealingTest, ADamagedOrLostIndexIsMadeAnewAndToldUntilItIsComplete) {
  const struct {
    const char* what;
    std::function<void()> damage;
    bool kept = true;
  } kRows[] = {
      {"header", [this] { WriteGarbage(); }},
      {"cut", [this] { fs::resize_file(file_, fs::file_size(file_) / 2); }},
      {"one bit of pages that only a search reads",
       [this] {
         ChangePages([](std::string& page) {
           if (page.find("lantern") != std::string::npos && page[0] == 0x0D) page[0] = 0x4D;
         });
       }},
      {"gone", [this] { fs::remove(file_); }, false},
      {"emptied", [this] { fs::resize_file(file_, 0); }, false},
      {"gone with its folder", [this] { fs::remove_all(folder_ / "a"); }, false},
      {"gone while it is open", [this] { (void)Search(), fs::remove(file_); }, false},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.what);
    clock_.now_ms += 2LL * 86400 * 1000;
    Restart();
    row.damage();
    const Json::Value met = Search();
    EXPECT_EQ(met["total"], 0);
    EXPECT_EQ(met["left_out"][0]["id"], "a") << "nobody takes nothing for all";
    const Json::Value found = Rebuilding();
    EXPECT_GE(found["since"].asInt64(), clock_.Now());
    Restart();
    const Json::Value searched = Send("search", R"({"query":"lantern","id":"a"})")["data"]["left_out"][0];
    EXPECT_EQ(searched["code"], Error::kEngineIndexRebuilding);
    EXPECT_EQ(searched["searched"], true);
    const auto kept = SetAside();
    ASSERT_EQ(kept.size(), row.kept ? 1U : 0U);
    struct stat status = {};
    EXPECT_TRUE(kept.empty() || (stat(kept[0].c_str(), &status) == 0 && (status.st_mode & 0777) == 0600));
    Fill();
    EXPECT_EQ(Code("index_rebuilt", R"({"id":"a","since":1})"), 0);
    EXPECT_EQ(Rebuilding(), found) << "another one was meant";
    EXPECT_EQ(Code("index_rebuilt", R"({"id":"a","since":)" + found["since"].asString() + "}"), 0);
    EXPECT_TRUE(Rebuilding().isNull() && SetAside().empty());
    EXPECT_TRUE(Search()["left_out"].empty());
    EXPECT_EQ(Search()["total"], 100);
  }
}

TEST_F(HealingTest, DamageThatNoRequestReadsIsFoundWithinAWeek) {
  EXPECT_EQ(Code("index_stat", R"({"id":"a"})"), 0);
  while (Scrubbed() == 0) std::this_thread::yield();
  engine_.reset();
  std::string content = test::ReadFile(file_);
  content[content.size() - 8192 * 3 + 4000] ^= 1;
  test::WriteFile(file_, content);
  Restart();
  EXPECT_EQ(Code("index_stat", R"({"id":"a"})"), 0);
  EXPECT_TRUE(Rebuilding().isNull());
  clock_.now_ms += 8LL * 86400 * 1000;
  while (Rebuilding().isNull()) (void)Commit("a");
  EXPECT_EQ(Rebuilding()["since"], clock_.Now());
}

TEST_F(HealingTest, AfterTwoInADayItStopsUnlessItIsAsked) {
  for (int time = 0; time < 2; ++time) {
    WriteGarbage();
    EXPECT_EQ(Commit("a"), 0) << "made anew";
    clock_.now_ms += 3600 * 1000;
  }
  WriteGarbage();
  EXPECT_NE(Refusal().find("look at the disk"), std::string::npos);
  EXPECT_EQ(Search()["left_out"][0]["code"], 1407);
  EXPECT_EQ(fs::file_size(file_), 100000U);
  ASSERT_EQ(Code("index_rebuild", R"({"id":"a"})"), 0);
  WriteGarbage();
  EXPECT_EQ(Commit("a"), 0) << "what was before it was asked for does not count";
  EXPECT_EQ(SetAside().size(), 1U);
}

TEST_F(HealingTest, WhatMayPassLeavesTheIndexAsItIs) {
  const std::string good = test::ReadFile(file_);
  Database(file_, Database::Mode::kWrite).Execute("PRAGMA user_version = 99");
  Restart();
  EXPECT_NE(Refusal().find("format 99"), std::string::npos);
  fs::remove(file_);
  fs::create_directory(file_);
  const std::string refused = Send("index_rebuild", R"({"id":"a"})")["error"]["msg"].asString();
  EXPECT_NE(refused.find(file_ + " is not a regular file"), std::string::npos) << refused;
  fs::remove(file_);
  test::WriteFile(file_, good);
  engine_.reset();
  const std::string noted = folder_ / "state/indices.json";
  std::string other = test::ReadFile(noted);
  other.replace(other.find("\"mount_point\":\"") + 15, 0, "/elsewhere");
  test::WriteFile(noted, other);
  fs::rename(folder_ / "a", folder_ / "away");
  Restart();
  EXPECT_NE(Refusal().find("not to be mounted"), std::string::npos);
  fs::rename(folder_ / "away", folder_ / "a");
  fs::rename(file_, file_ + ".kept");
  fs::create_directory(file_);  // cannot be opened, as without rights
  EXPECT_NE(Refusal().find("cannot be opened"), std::string::npos);
  fs::remove(file_);
  fs::rename(file_ + ".kept", file_);
  EXPECT_EQ(Total("lantern"), 100);
  EXPECT_TRUE(Rebuilding().isNull() && SetAside().empty());
}

TEST_F(HealingTest, ADamagedListOfIndicesCostsNothing) {
  ASSERT_EQ(Create("b", "b"), 0);
  ASSERT_EQ(Code("index_pause", R"({"id":"b"})"), 0);
  const std::string list = folder_ / "state/indices.json";
  for (const std::string& damage : {std::string("{\"a\":{\"pa"), std::string(), std::string(R"({"a":{"path":7}})")}) {
    engine_.reset();
    test::WriteFile(list, damage);
    Restart();
    EXPECT_EQ(Search()["total"], 100);
    EXPECT_EQ(Commit("b"), 1409) << "still paused";
  }
  engine_.reset();
  test::WriteFile(list, "{");
  test::WriteFile(list + ".copy", "{");
  Restart();
  EXPECT_EQ(Create("a", "a"), 0);
  EXPECT_EQ(Search()["total"], 100) << "found again where it was";
}

}  // namespace
}  // namespace ferrox::engine
