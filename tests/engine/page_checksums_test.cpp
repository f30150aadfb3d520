// Catches damage of an index file that changes answers instead of being found, and whole pages that count as damaged.
#include "services/kovaelasticd/store/page_checksums.h"

#include <sqlite3.h>

#include <chrono>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "base/scope_exit.h"
#include "services/kovaelasticd/store/scrubber.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/fake_clock.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

constexpr size_t kPage = 8192;
constexpr size_t kReservedAt = 20;
constexpr int64_t kDayMs = kDaySec * 1000;

class PageChecksumsTest : public testing::Test {
 protected:
  static void Put(IndexStore& store, int number, const std::string& words) {
    const std::string path = "/v/folder/name" + std::to_string(number) + ".txt";
    std::string text = words;
    for (int word = 0; word < 150; ++word) text += " w" + std::to_string((number * 7919 + word * 104729) % 5000);
    store.Upsert(path, FileDocument(path, text));
  }
  static std::unique_ptr<SqliteStore> Open(const std::string& file) {
    return std::make_unique<SqliteStore>(file, true, PlainSchema());
  }
  /// An index of 200 documents, closed.
  static void Fill(const std::string& file) {
    const auto store = Open(file);
    for (int number = 0; number < 200; ++number) Put(*store, number, number % 3 == 0 ? "lantern" : "harbour");
    store->Commit();
    store->RebuildSuggestions();
    store->Commit();
  }
  /// What searches and a listing answer; "damaged" when one of them finds that.
  static std::string Answers(const std::string& file) {
    std::string answers;
    try {
      SqliteStore store(file, false, PlainSchema());
      for (const char* query : {"lantern", "harbour w77", "w1*", "name:name17", "path:/v/folder size:>1k", "lanterm"}) {
        const SearchReply reply = Find(store, query);
        answers += std::to_string(reply.total) + "\n";
        for (const SearchHit& hit : reply.hits) answers += hit.path + std::to_string(hit.score) + hit.snippet + "\n";
        for (const std::string& word : reply.suggestions) answers += word + "\n";
      }
      store.Get({"", "/v", "", -1, {}}, [&answers](const Json::Value& entry) { answers += entry.toStyledString(); });
    } catch (const IndexDamaged&) {
      return "damaged";
    }
    return answers;
  }
  static bool IsDue(const Scrubber& scrubber) {
    return scrubber.NextTurn() < Scrubber::SteadyClock::now() + std::chrono::hours(1);
  }
  /// Has the scrubber do what is due, to the end.
  static void Finish(Scrubber& scrubber) {
    while (IsDue(scrubber)) {
      std::this_thread::sleep_until(scrubber.NextTurn());
      scrubber.Turn();
    }
  }
  /// Whether the weekly reading finds nothing.
  bool IsFoundWhole(const std::string& file) {
    const int64_t before_ms = clock_.now_ms;
    const base::ScopeExit restore([this, before_ms] { clock_.now_ms = before_ms; });  // scores depend on the time
    Scrubber scrubber(file);
    try {
      Finish(scrubber);
      clock_.now_ms += 7 * kDayMs;
      Finish(scrubber);
      return true;
    } catch (const IndexDamaged&) {
      return false;
    }
  }

  test::TempDir folder_;
  const std::string file_ = folder_ / "index.sqlite";
  const std::string other_ = folder_ / "other.sqlite";
  test::FakeClock clock_;
};

TEST_F(PageChecksumsTest, AnyChangeOfAPageIsFoundAndNeverAnswered) {
  Fill(file_);
  const std::string good = test::ReadFile(file_);
  const std::string answers = Answers(file_);
  ASSERT_GT(answers.size(), 10000U);
  std::mt19937 random(11);
  int found_at_once = 0;
  const auto expect_found = [&](const std::string& damaged) {
    test::WriteFile(other_, damaged);
    const std::string now = Answers(other_);
    EXPECT_TRUE(now == answers || now == "damaged");
    found_at_once += now == "damaged";
    EXPECT_FALSE(IsFoundWhole(other_));
  };
  for (int round = 0; round < 100; ++round) {
    const size_t bit = round < 8 ? kReservedAt * 8 + static_cast<size_t>(round) : random() % (good.size() * 8);
    SCOPED_TRACE("bit " + std::to_string(bit));
    std::string damaged = good;
    damaged[bit / 8] = static_cast<char>(damaged[bit / 8] ^ (1 << bit % 8));
    expect_found(damaged);
  }
  EXPECT_GT(found_at_once, 25);
  expect_found(good.substr(0, kPage * 3) + good.substr(kPage * 4, kPage) + good.substr(kPage * 3, kPage) +
               good.substr(kPage * 5));  // two pages in each other's place
  expect_found(good.substr(0, good.size() - kPage / 2));
  EXPECT_TRUE(test::ReadFile(file_) == good) << "asking changes nothing";
  EXPECT_TRUE(IsFoundWhole(file_));
}

/// Each byte counts, and the checksum is the same on all hosts.
TEST_F(PageChecksumsTest, TheChecksumIsThatOfTheFormat) {
  std::vector<uint8_t> page(512);
  for (size_t at = 0; at < page.size(); ++at) page[at] = static_cast<uint8_t>(at * 7);
  EXPECT_EQ(PageChecksum(page.data(), page.size(), 3), 0xC32CAEF55AC3BAF6U);
}

TEST_F(PageChecksumsTest, TheLogIsCheckedAndRepairsPagesThatAPowerCutLeftHalfWritten) {
  Fill(file_);
  const auto store = Open(file_);
  for (int number = 0; number < 200; number += 10) Put(*store, number, "beacon");
  store->Commit();
  const std::string answers = Answers(file_);
  const std::string log = test::ReadFile(file_ + "-wal");
  ASSERT_GT(log.size(), 20 * kPage);
  // As they are found after a power cut within a checkpoint.
  std::string torn = test::ReadFile(file_);
  for (size_t at = 32; at < log.size(); at += 24 + kPage) {
    const auto byte = [&](size_t i) { return static_cast<size_t>(static_cast<unsigned char>(log[at + i])); };
    const size_t page_at = ((byte(2) << 8 | byte(3)) - 1) * kPage;
    if (page_at + kPage <= torn.size()) torn.replace(page_at + kPage / 2, kPage / 2, kPage / 2, 'x');
  }
  for (const bool searched_first : {true, false}) {
    test::WriteFile(other_, torn);
    test::WriteFile(other_ + "-wal", log);
    if (!searched_first) {
      EXPECT_TRUE(IsFoundWhole(other_));
    }
    EXPECT_TRUE(Answers(other_) == answers);
  }
  // What is damaged in the log while it is in use.
  std::mt19937 random(5);
  int found = 0;
  for (int round = 0; round < 30; ++round) {
    std::string damaged = log;
    const size_t at = 32 + random() % (log.size() - 32);
    damaged[at] = static_cast<char>(damaged[at] ^ 4);
    test::WriteFile(file_ + "-wal", damaged);
    const std::string now = Answers(file_);
    EXPECT_TRUE(now == answers || now == "damaged") << "byte " << at;
    found += now == "damaged";
    test::WriteFile(file_ + "-wal", log);
  }
  EXPECT_GT(found, 5);
  EXPECT_TRUE(Answers(file_) == answers);
}

/// The log's frames are written anew within a transaction that does not fit in the cache, and taken back.
TEST_F(PageChecksumsTest, LargeTransactionsReadWhatTheyWrote) {
  Database database(file_, Database::Mode::kCreate);
  database.Execute("PRAGMA journal_mode = WAL; PRAGMA cache_size = 10");
  database.Execute("CREATE TABLE t(id INTEGER PRIMARY KEY, sum INTEGER, v BLOB)");
  std::mt19937 random(3);
  for (int transaction = 0; transaction < 10; ++transaction) {
    database.Execute("BEGIN");
    for (int change = 0; change < 300; ++change) {
      const std::string id = std::to_string(random() % 200);
      if (change % 50 == 20) database.Execute("SAVEPOINT s");
      database.Execute("INSERT OR REPLACE INTO t VALUES(" + id + ", " + id + ", randomblob(3000))");
      if (change % 50 == 40) database.Execute("ROLLBACK TO s; RELEASE s");
      if (change % 10 == 0) (void)database.QueryInt("SELECT sum(length(v)) FROM t");
    }
    database.Execute(transaction % 4 == 3 ? "ROLLBACK" : "COMMIT");
    Database reader(file_, Database::Mode::kRead);
    EXPECT_EQ(reader.QueryInt("SELECT sum(sum) = sum(id) AND max(length(v)) = 3000 FROM t"), 1);
  }
  EXPECT_EQ(database.QueryInt("SELECT count(*) FROM pragma_integrity_check WHERE integrity_check = 'ok'"), 1);
}

TEST_F(PageChecksumsTest, AFileOfBeforeThemIsReadAndWritten) {
  sqlite3* plain = nullptr;
  ASSERT_EQ(sqlite3_open(file_.c_str(), &plain), SQLITE_OK);
  constexpr char kMake[] = "PRAGMA page_size = 8192; CREATE TABLE t(i); DROP TABLE t";
  ASSERT_EQ(sqlite3_exec(plain, kMake, nullptr, nullptr, nullptr), SQLITE_OK);
  ASSERT_EQ(sqlite3_close(plain), SQLITE_OK);
  Fill(file_);
  Fill(other_);
  for (const char* word : {"beacon", "lantern", "lantern"}) {
    ASSERT_EQ(test::ReadFile(file_)[kReservedAt], 0);
    const auto store = Open(file_);
    Put(*store, 0, word);
    store->Commit();
    EXPECT_EQ(FindPaths(*store, "beacon").empty(), word != std::string("beacon"));
  }
  EXPECT_TRUE(Answers(file_) == Answers(other_));
  EXPECT_TRUE(IsFoundWhole(file_)) << "it is not read";
}

TEST_F(PageChecksumsTest, TheFileIsReadOnceAWeekWhateverTheClockDoes) {
  Fill(file_);
  const auto store = Open(file_);
  Scrubber scrubber(file_);
  const auto begins = [](Scrubber& asked) {
    if (!IsDue(asked)) return false;
    std::this_thread::sleep_until(asked.NextTurn());
    asked.Turn();
    return asked.InPass();
  };
  EXPECT_FALSE(begins(scrubber)) << "it is new";
  clock_.now_ms += 6 * kDayMs;
  EXPECT_FALSE(begins(scrubber));
  clock_.now_ms += kDayMs;
  EXPECT_TRUE(begins(scrubber));
  Finish(scrubber);
  for (const int64_t days : {-20000, 20001, -3}) {
    clock_.now_ms += days * kDayMs;
    Scrubber opened_now(file_);
    EXPECT_FALSE(begins(scrubber)) << days;
    EXPECT_FALSE(begins(opened_now)) << days;
    EXPECT_FALSE(IsDue(opened_now)) << days;
  }
}

}  // namespace
}  // namespace ferrox::engine
