// Catches an index that does not end as the disk, however the worker is interrupted and files change meanwhile.
#include "services/fileindexd/share_worker.h"

#include <unistd.h>

#include <algorithm>
#include <atomic>

#include "tests/indexd/worker_test.h"

namespace ferrox::indexd {
namespace {

using ShareWorkerTest = WorkerTest;

/// From Begin on, all files but the awaited ones take to read until those are written; 60 s if they never are.
class SlowFiles {
 public:
  SlowFiles(FakeIndex& index, const std::set<std::string>& awaited) : awaited_(awaited), left_(awaited) {
    index.before_read = [this](const std::string& path) {
      for (int i = 0; slow_ && awaited_.count(path) == 0 && i < 6000; ++i) usleep(10000);
      if (awaited_.count(path) == 0) slow_ = false;
    };
  }
  void Begin() { slow_ = true; }
  void Written(const std::string& path) {
    left_.erase(path);
    if (left_.empty()) slow_ = false;
  }

 private:
  const std::set<std::string> awaited_;
  std::set<std::string> left_;
  std::atomic<bool> slow_{false};
};

TEST_F(ShareWorkerTest, RenamesReadNoFilesAndKindsOfFilesMayChange) {
  test::WriteFile(At("old/deep/a"), "1");
  test::WriteFile(At("f"), "2");
  Process(Line(kReindex, root));
  fs::rename(At("old"), At("moved"));
  fs::remove(At("f"));
  test::WriteFile(At("f/inside"), "a folder in the place of a file");
  Process(Line(kRename, At("moved"), At("old"), true) + Line(kDelete, At("f")) + Line(kCreate, At("f"), "", true));
  EXPECT_EQ(Expected(), Indexed());
  EXPECT_EQ(1, index->renames);
  EXPECT_EQ(0, index->upserts[At("moved/deep/a")]);
  EXPECT_FALSE(fs::exists(queue_path + ".tmp"));
}

TEST_F(ShareWorkerTest, ReindexTouchesOnlyWhatDiffers) {
  for (int i = 0; i < 1100; ++i) test::WriteFile(At("d" + std::to_string(i % 7) + "/f" + std::to_string(i)), "x");
  Process(Line(kReindex, root));
  index->upserts.clear();
  test::WriteFile(At("d3/f3"), "changed");
  fs::remove(At("d4/f4"));
  Process(Line(kReindex, root));
  EXPECT_EQ(Expected(), Indexed());
  EXPECT_EQ((std::map<std::string, int>{{At("d3/f3"), 1}, {At("d4"), 1}}), index->upserts);
}

TEST_F(ShareWorkerTest, CopiedTreeIsComparedOnce) {
  Process(Line(kReindex, root));
  index->lists = 0;
  std::string lines;
  std::string name = "d";
  for (int depth = 0; depth < 50; ++depth, name += "/d") {
    test::WriteFile(At(name + "/f"), "x");
    lines += Line(kCreate, At(name), "", true);
  }
  Process(lines);
  EXPECT_EQ(Expected(), Indexed());
  EXPECT_LE(index->lists, 2);
}

TEST_F(ShareWorkerTest, FilesThatChangeBesideSlowOnesAreWrittenSoon) {
  early_write_interval = std::chrono::milliseconds(0);
  worker = MakeWorker();
  for (int i = 0; i < 300; ++i) test::WriteFile(At("f" + std::to_string(i)), "x");
  SlowFiles slow(*index, {At("aa"), At("f5")});
  std::vector<std::string> written;
  index->before_write = [this, &written, &slow](const std::string& path) {
    written.push_back(fs::path(path).filename());
    slow.Written(path);
    if (written.size() != 20) return;
    slow.Begin();
    test::WriteFile(At("aa"), "new");
    test::WriteFile(At("f5"), "changed");
    Queue("not json\n" + Line(kCreate, At("aa")) + Line(kModify, At("f5")) + Line(kModify, At("gone")) +
          Line(kCreate, "/elsewhere") + Line(kDelete, At("f7")) + "{\"event\":2,\"path\":\"" + At("f9"));
  };
  fs::remove(queue_path);
  Queue(Line(kReindex, root));
  worker->RunOnce();
  EXPECT_LT(std::find(written.begin(), written.end(), "aa") - written.begin(), 300) << "before the pass is through";
  EXPECT_EQ(Expected(), Indexed());
  EXPECT_EQ(2, index->upserts[At("aa")]) << "and again in their turn";
}

TEST_F(ShareWorkerTest, ProgressCountsWhatIsDone) {
  for (int i = 0; i < 30; ++i) test::WriteFile(At("f" + std::to_string(i)), "x");
  unsigned written = 0;
  index->before_write = [this, &written](const std::string&) {
    EXPECT_LE(worker->Status()["comparison"]["examined"].asUInt(), written++);
  };
  Process(Line(kReindex, root));
  EXPECT_EQ(written, worker->Status()["comparison"]["examined"].asUInt());
}

TEST_F(ShareWorkerTest, FileThatIsWrittenWhileItsAttributesAreReadKeepsNoOldText) {
  test::WriteFile(At("f"), "old");
  Process(Line(kCreate, At("f")));
  index->before_attr = [](const std::string& path) { test::WriteFile(path, "new text"); };
  Process(Line(kAttr, At("f")));
  EXPECT_EQ(Expected(), Indexed());
}

TEST_F(ShareWorkerTest, FileWrittenAheadDoesNotOutliveItsFolder) {
  early_write_interval = std::chrono::milliseconds(0);
  worker = MakeWorker();
  for (int i = 0; i < 300; ++i) test::WriteFile(At("f" + std::to_string(i)), "x");
  SlowFiles slow(*index, {At("b/x")});
  int writes = 0;
  index->before_write = [this, &writes, &slow](const std::string& path) {
    slow.Written(path);
    if (path == At("b/x")) {
      fs::remove_all(At("b"));
      test::WriteFile(At("b"), "file again");
      Queue(Line(kDelete, At("b/x")) + Line(kDelete, At("b"), "", true) + Line(kCreate, At("b")));
    }
    if (++writes != 20) return;
    slow.Begin();
    fs::create_directory(At("b"));
    test::WriteFile(At("b/x"), "for a moment");
    Queue(Line(kCreate, At("b")) + Line(kDelete, At("b")) + Line(kCreate, At("b"), "", true) +
          Line(kCreate, At("b/x")));
  };
  fs::remove(queue_path);
  Queue(Line(kReindex, root));
  worker->RunOnce();
  EXPECT_EQ(Expected(), Indexed());
}

TEST_F(ShareWorkerTest, ChangeUnderOneNameReachesTheOthers) {
  test::WriteFile(At("a"), "1");
  fs::create_directory(At("d"));
  Process(Line(kReindex, root));
  const auto expect_current = [this] {
    EXPECT_EQ(Expected(), Indexed());
    for (const auto& [path, document] : index->documents) {
      struct stat status = {};
      ASSERT_EQ(0, lstat(path.c_str(), &status));
      EXPECT_EQ(KOVA::CONTENT_EXTRACT::Stamp(status), document.stamp) << path;
    }
  };
  fs::create_hard_link(At("a"), At("b"));
  fs::create_hard_link(At("a"), At("c"));
  test::WriteFile(At("c"), "2");
  Process(Line(kCreate, At("b")) + Line(kCreate, At("c")));
  expect_current();
  test::WriteFile(At("b"), "3");
  Process(Line(kModify, At("b")));
  expect_current();
  fs::permissions(At("b"), fs::perms::owner_read);
  Process(Line(kAttr, At("b")));
  expect_current();
  fs::remove(At("b"));
  Process(Line(kDelete, At("b")));
  expect_current();
}

TEST_F(ShareWorkerTest, WhatIsNotIndexedIsTakenOut) {
  fs::create_symlink("/etc/passwd", At("x"));
  fs::create_directory_symlink(folder.Path(), At("link"));
  for (const std::string& file : {folder / "x", At(".DS_Store"), At("#recycle/x")}) {
    test::WriteFile(file, "x");
  }
  std::string lines;
  for (const char* name : {"x", ".DS_Store", "link", "link/x"}) {
    lines += Line(kCreate, At(name)) + Line(kAttr, At(name));
  }
  Process(lines);
  EXPECT_EQ(std::set<std::string>{}, Indexed());
  Process(Line(kReindex, root));
  EXPECT_EQ(std::set<std::string>{}, Indexed());
}

TEST_F(ShareWorkerTest, VanishedFilesAndForeignPathsStopNothing) {
  test::WriteFile(At("moved"), "1");
  Process(Line(kCreate, At("moved")));
  fs::rename(At("moved"), At("there"));
  std::string deep = root;  // nobody can open such a path, but folders nested so deep can be made
  for (int depth = 0; depth < 100000; ++depth) deep += "/d";
  Process(Line(kCreate, At("gone")) + Line(kModify, "/etc/passwd") + Line(kAttr, At("gone2")) +
          Line(kRename, At("gone4"), At("gone3")) + "not json\n" + Line(kCreate, deep) + Line(kReindex, deep) +
          Line(kRename, deep, At("moved")) + Line(kRename, At("gone5"), deep) + Line(kCreate, At("there")));
  EXPECT_EQ(Expected(), Indexed());
}

/// The engine stops after each number of writes in turn; the next process must come to the same end, whatever had been
/// carried out, also when the old name is in use again.
TEST_F(ShareWorkerTest, StoppedAnywhereAndTakenUpAgainEndsTheSame) {
  for (int writes = 0; writes < 8; ++writes) {
    SCOPED_TRACE(writes);
    fs::remove_all(root);
    for (const char* name : {"a", "b/x", "b/y", "c"}) test::WriteFile(At(name), name);
    Process(Line(kReindex, root));
    fs::rename(At("a"), At("a2"));
    fs::rename(At("b"), At("b2"));
    fs::rename(At("b2"), At("b3"));
    test::WriteFile(At("a"), "another in the old place");
    Queue(Line(kRename, At("a2"), At("a")) + Line(kRename, At("b2"), At("b"), true) + Line(kCreate, At("a")) +
          Line(kRename, At("b3"), At("b2"), true) + Line(kReindex, At("c")));
    int left = writes;
    index->before_write = [&left](const std::string&) {
      if (left-- <= 0) throw Error(Error::kEngineUnreachable, "stopped");
    };
    try {
      worker->RunOnce();
    } catch (const Error&) {
    }
    Restart();
    worker->RunOnce();
    EXPECT_EQ(Expected(), Indexed());
  }
}

TEST_F(ShareWorkerTest, PauseStopsInTheMiddleAndKeepsTheQueue) {
  for (int i = 0; i < 200; ++i) test::WriteFile(At("f" + std::to_string(i)), "x");
  int writes = 0;
  index->before_write = [this, &writes](const std::string&) {
    if (++writes != 20) return;
    pause.Set(0);
    worker->Wake();
  };
  EXPECT_THROW(Process(Line(kReindex, root)), Interrupted);
  EXPECT_LT(index->documents.size(), 100U);
  EXPECT_EQ(1, index->commits) << "what was done by then is kept";
  pause.Set(-1);
  Restart();
  worker->RunOnce();
  EXPECT_EQ(Expected(), Indexed());
}

TEST_F(ShareWorkerTest, MissingIndexIsMadeAfterAWhileAndFilled) {
  patience = std::chrono::hours(1);
  worker = MakeWorker();
  test::WriteFile(At("a"), "1");
  index->exists = false;
  EXPECT_THROW(worker->RunOnce(), Error) << "it may be about to get this name";
  patience = std::chrono::milliseconds(0);
  worker = MakeWorker();
  index->exists = false;
  SetFolders({});
  EXPECT_THROW(worker->RunOnce(), Error) << "its last folder is gone";
  EXPECT_EQ(0, index->creations);
  SetFolders({{"", "davp"}});
  worker->RunOnce();
  EXPECT_EQ(1, index->creations);
  EXPECT_EQ(Expected(), Indexed());
}

TEST_F(ShareWorkerTest, AnIndexThatWasMadeAnewIsFilledAndSaidToBeComplete) {
  for (int i = 0; i < 50; ++i) test::WriteFile(At("f" + std::to_string(i)), "x");
  Process(Line(kReindex, root));
  for (const bool again : {false, true}) {
    index->documents.clear();
    index->rebuilding = again ? 3 : 1;
    bool met = again;
    index->before_write = [&](const std::string&) {
      if (!std::exchange(met, true)) index->rebuilding = 2;  // once more, unseen by what is under way
    };
    worker->CheckIndex();
    worker->RunOnce();
    EXPECT_EQ(Expected(), Indexed());
    EXPECT_EQ(again ? 0 : 2, index->rebuilding) << "of another one nothing is said yet";
    worker->RunOnce();
    EXPECT_EQ(0, index->rebuilding);
  }
  index->upserts.clear();
  index->rebuilding = 4;
  Restart();
  index->rebuilding = 4;
  worker->RunOnce();
  EXPECT_EQ(0, index->rebuilding);
  EXPECT_TRUE(index->upserts.empty()) << "what it holds is not read again";
}

TEST_F(ShareWorkerTest, PausedIndexIsResumedWhenNoFolderIsPaused) {
  index->paused = true;
  Configure(share, {{"", "davp"}}, true);
  worker->Start();
  WaitForState("paused");
  EXPECT_TRUE(index->paused);
  SetFolders({{"", "davp"}});
  worker->Wake();
  WaitForState("idle");
}

}  // namespace
}  // namespace ferrox::indexd
