// Catches searches that wait for writers, and committed changes lost beside failures, full disks and threads.
#include "services/kovaelasticd/indices/index.h"

#include <atomic>
#include <filesystem>
#include <functional>
#include <future>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "common/error.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

class IndexTest : public testing::Test {
 protected:
  void Open(std::chrono::milliseconds auto_commit_after = std::chrono::hours(1)) {
    auto store = std::make_unique<SqliteStore>(folder_ / "index.sqlite", true, PlainSchema());
    store_ = store.get();
    index_ = std::make_unique<Index>(std::move(store), folder_ / "uncommitted", auto_commit_after);
  }
  void Put(const std::string& path, const std::string& text = "lantern") {
    index_->Write([&](IndexStore& store) { store.Upsert(path, FileDocument(path, text)); });
  }
  int64_t Total(const std::string& text) {
    const QueryNode query = ParseQuery(text, 0);
    SearchRequest request;
    request.query = &query;
    return index_->Search(request).total;
  }
  /// The code that `change` fails with, 0 for none.
  static int CodeOf(const std::function<void()>& change) {
    try {
      change();
      return 0;
    } catch (const Error& error) {
      return error.Code();
    }
  }
  int CommitCode() {
    return CodeOf([this] { index_->Commit(); });
  }

  test::TempDir folder_;
  SqliteStore* store_ = nullptr;
  std::unique_ptr<Index> index_;
};

TEST_F(IndexTest, ASearchDoesNotWaitForAChange) {
  Open();
  Put("/v/1");
  index_->Commit();
  std::promise<void> started;
  std::promise<void> finish;
  std::thread writer([&] {
    index_->Write([&](IndexStore& store) {
      store.Upsert("/v/2", FileDocument("/v/2", "lantern"));
      started.set_value();
      finish.get_future().wait();
    });
  });
  started.get_future().wait();
  EXPECT_EQ(Total("lantern"), 1);
  EXPECT_EQ(index_->Stat().documents, 1);
  finish.set_value();
  writer.join();
  index_->Commit();
  EXPECT_EQ(Total("lantern"), 2);
}

TEST_F(IndexTest, WhatNobodyCommitsIsCommittedAfterAWhile) {
  Open(std::chrono::milliseconds(1));
  Put("/v/1");
  while (Total("lantern") == 0) std::this_thread::yield();
  while (std::filesystem::exists(folder_ / "uncommitted")) std::this_thread::yield();
  EXPECT_EQ(CommitCode(), 0);
}

/// Has something to give back after each search.
class HoldingStore : public SqliteStore {
 public:
  using SqliteStore::SqliteStore;
  SearchReply Search(const SearchRequest& request) override {
    holds = true;
    return SqliteStore::Search(request);
  }
  std::optional<std::chrono::steady_clock::time_point> NextGiveBack() const override {
    return holds ? std::optional(std::chrono::steady_clock::now()) : std::nullopt;
  }
  void GiveBack(std::chrono::steady_clock::time_point /*now*/) override { holds = false; }
  std::atomic<bool> holds{false};
};

TEST_F(IndexTest, WhatASearchLeavesInMemoryIsGivenBackWithoutARequest) {
  auto store = std::make_unique<HoldingStore>(folder_ / "index.sqlite", true, PlainSchema());
  const HoldingStore& holding = *store;
  index_ = std::make_unique<Index>(std::move(store), folder_ / "uncommitted", std::chrono::hours(1));
  for (int round = 0; round < 3; ++round) {
    EXPECT_EQ(Total("lantern"), 0);
    while (holding.holds) std::this_thread::yield();
  }
}

TEST_F(IndexTest, ManyWritersAndReadersAgree) {
  Open();
  std::atomic<int> wrong{0};
  const auto write_and_read = [&](int writer) {
    for (int64_t before = 0, i = 0; i < 30; ++i) {
      const std::string name = std::to_string(writer) + "x" + std::to_string(i);
      Put("/v/" + name, "lantern w" + name);
      index_->Commit();
      const int64_t now = Total("lantern");
      if (Total("w" + name) != 1 || now <= before) ++wrong;
      before = now;
    }
  };
  std::vector<std::thread> threads;
  for (int writer = 0; writer < 3; ++writer) threads.emplace_back(write_and_read, writer);
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(wrong, 0);
  EXPECT_EQ(Total("lantern"), 90);
}

TEST_F(IndexTest, AFullDiskLosesNothingThatWasCommitted) {
  Open();
  Put("/v/kept");
  index_->Commit();
  store_->LimitPages(1);  // as if the disk were full: nothing can be added
  std::string text;
  for (int i = 0; i < 20000; ++i) text += "word" + std::to_string(i) + " ";
  const auto put_large = [&] {
    for (int i = 0; i < 10; ++i) Put("/v/large" + std::to_string(i), text);
    index_->Commit();
  };
  EXPECT_EQ(CodeOf(put_large), Error::kEngineStorage);
  (void)CommitCode();  // tells that the changes before it are lost
  EXPECT_EQ(Total("lantern"), 1);
  EXPECT_EQ(Total("word7"), 0);
  store_->LimitPages(0);
  EXPECT_EQ(CodeOf(put_large), 0);
  EXPECT_EQ(Total("word7"), 10);
  EXPECT_EQ(Total("lantern"), 1);
}

TEST_F(IndexTest, ChangesThatAreGivenUpFailTheCommitBehindThem) {
  Open();
  Put("/v/1");
  const auto fail = [this](Error::ErrorCode code) { index_->Write([code](IndexStore&) { throw Error(code, "no"); }); };
  EXPECT_THROW(fail(Error::kEngineStorage), Error);
  EXPECT_EQ(CommitCode(), Error::kEngineStorage);
  EXPECT_EQ(CommitCode(), 0);
  EXPECT_EQ(Total("lantern"), 0);
  Put("/v/1");
  EXPECT_THROW(fail(Error::kEngineNoSuchDocument), Error);
  EXPECT_EQ(CommitCode(), 0) << "a change that was refused takes nothing with it";
  EXPECT_EQ(Total("lantern"), 1);
}

TEST_F(IndexTest, AClosedIndexSaysSo) {
  Open();
  Put("/v/1");
  index_->Close();
  EXPECT_EQ(CommitCode(), Error::kEngineIndexPaused);
  EXPECT_EQ(CodeOf([this] { (void)index_->Stat(); }), Error::kEngineIndexPaused);
}

}  // namespace
}  // namespace ferrox::engine
