#include "services/fileindexd/share_worker.h"

#include <sys/stat.h>

#include <filesystem>
#include <random>
#include <set>

#include <gtest/gtest.h>

#include "common/json_util.h"
#include "platform/host/share_table.h"
#include "sdk/share.h"
#include "tests/indexd/fake_index.h"
#include "tests/support/temp_dir.h"

namespace ferrox::indexd {
namespace {

namespace fs = std::filesystem;
using test::FakeIndex;

std::string Line(unsigned event, const std::string& path, const std::string& path_old = "", bool is_dir = false) {
  Json::Value line;
  line["event"] = event;
  line["path"] = path;
  line["path_old"] = path_old;
  line["is_dir"] = is_dir;
  return toString(line) + "\n";
}

constexpr unsigned kModify = 0x2, kAttr = 0x4, kCreate = 0x40, kDelete = 0x80, kRename = 0x100, kCrashed = 0x200,
                   kReindex = 0x10000;

/// A share in a fresh folder, its worker, and an index in memory.
class ShareWorkerTest : public testing::Test {
 protected:
  void SetUp() override {
    share = "s" + std::to_string(++last_share);
    root = fs::canonical(folder.Path()).string() + "/" + share;
    fs::create_directory(root);
    kova::host::ShareEntry entry;
    entry.name = share;
    entry.path = root;
    kova::host::AddShare(entry);
    queue_path = sdk::SDKShare(share).GetQueuePath();
    worker = MakeWorker();
  }

  void TearDown() override {
    worker.reset();
    kova::host::RemoveShare(share);
  }

  std::unique_ptr<ShareWorker> MakeWorker() {
    return std::make_unique<ShareWorker>(share, ShareWorker::Environment{pool, pause, [this](const std::string&) {
                                                                           auto fake = std::make_unique<FakeIndex>();
                                                                           fake->documents = kept;
                                                                           index = fake.get();
                                                                           return fake;
                                                                         }});
  }

  /// Another process in the place of the first, which stopped where it was.
  void Restart() {
    kept = index->documents;
    worker = MakeWorker();
  }

  void Queue(const std::string& lines) { test::WriteFile(queue_path, test::ReadFile(queue_path) + lines); }
  void Process(const std::string& lines) {
    Queue(lines);
    worker->RunOnce();
  }
  std::string At(const std::string& name) const { return root + "/" + name; }

  /// The indexed paths below the root, and the content of files: "a=text" or "folder".
  std::set<std::string> Indexed() const {
    std::set<std::string> found;
    for (const auto& [path, document] : index->documents) {
      const std::string name = path.substr(root.size() + 1);
      found.insert(fs::is_regular_file(path) ? name + "=" + document.content : name);
    }
    return found;
  }
  std::set<std::string> OnDisk() const {
    std::set<std::string> found;
    for (const auto& entry : fs::recursive_directory_iterator(root)) {
      const std::string name = entry.path().string().substr(root.size() + 1);
      found.insert(entry.is_regular_file() ? name + "=" + test::ReadFile(entry.path()) : name);
    }
    return found;
  }

  static inline int last_share = 0;
  const test::TempDir folder;
  const InterruptibleClock clock;
  TaskPool pool{2};
  PauseState pause;
  std::string share, root, queue_path;
  std::map<std::string, FakeIndex::Document> kept;
  FakeIndex* index = nullptr;
  std::unique_ptr<ShareWorker> worker;
};

TEST_F(ShareWorkerTest, EachOperationGivesTheStateOfTheDisk) {
  test::WriteFile(At("old/deep/a"), "1");
  test::WriteFile(At("f"), "2");
  Process(Line(kReindex, root));
  EXPECT_EQ(OnDisk(), Indexed());

  test::WriteFile(At("f"), "changed");
  test::WriteFile(At("new"), "3");
  Process(Line(kModify, At("f")) + Line(kCreate, At("new")));
  EXPECT_EQ(OnDisk(), Indexed());

  fs::rename(At("old"), At("moved"));
  fs::remove(At("f"));
  Process(Line(kRename, At("moved"), At("old"), true) + Line(kDelete, At("f")));
  EXPECT_EQ(OnDisk(), Indexed());
  EXPECT_EQ(1, index->renames);
  EXPECT_EQ(1, index->upserts[At("old/deep/a")]);
  EXPECT_EQ(0, index->upserts[At("moved/deep/a")]) << "a rename moves documents without reading files";

  fs::remove(At("new"));
  test::WriteFile(At("new/inside"), "a folder in the place of a file");
  Process(Line(kDelete, At("new")) + Line(kCreate, At("new"), "", true));
  EXPECT_EQ(OnDisk(), Indexed());

  fs::remove_all(At("moved"));
  test::WriteFile(At("lost"), "the event of this was lost");
  Process(Line(kCrashed, root));
  EXPECT_EQ(OnDisk(), Indexed());
  EXPECT_FALSE(fs::exists(queue_path + ".tmp"));
}

TEST_F(ShareWorkerTest, ReindexTouchesOnlyWhatDiffers) {
  for (int i = 0; i < 2500; ++i) test::WriteFile(At("d" + std::to_string(i % 7) + "/f" + std::to_string(i)), "x");
  Process(Line(kReindex, root));
  index->upserts.clear();
  test::WriteFile(At("d3/f3"), "changed");
  fs::remove(At("d4/f4"));
  Process(Line(kReindex, root));
  EXPECT_EQ(OnDisk(), Indexed());
  EXPECT_EQ((std::map<std::string, int>{{At("d3/f3"), 1}, {At("d4"), 1}}), index->upserts);
}

TEST_F(ShareWorkerTest, CopiedTreeIsComparedOnce) {
  std::string lines;
  std::string name = "d";
  for (int depth = 0; depth < 50; ++depth, name += "/d") {
    test::WriteFile(At(name + "/f"), "x");
    lines += Line(kCreate, At(name), "", true);
  }
  Process(lines);
  EXPECT_EQ(OnDisk(), Indexed());
  EXPECT_LE(index->lists, 2);
}

TEST_F(ShareWorkerTest, WhatIsNotIndexedIsTakenOut) {
  struct Row {
    const char* what;
    std::function<void()> make;
  };
  const Row rows[] = {
      {"a link", [this] { fs::create_symlink("/etc/passwd", At("x")); }},
      {"a preserved name", [this] { test::WriteFile(At(".DS_Store"), "x"); }},
      {"through a link",
       [this] {
         test::WriteFile(folder / "x", "x");
         fs::create_directory_symlink(folder.Path(), At("link"));
       }},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    row.make();
    for (const char* name : {"x", ".DS_Store", "link", "link/x"}) {
      Queue(Line(kCreate, At(name)) + Line(kAttr, At(name)));
    }
    worker->RunOnce();
    EXPECT_EQ(std::set<std::string>{}, Indexed());
  }
}

TEST_F(ShareWorkerTest, VanishedFilesAndForeignPathsStopNothing) {
  test::WriteFile(At("there"), "1");
  Process(Line(kCreate, At("gone")) + Line(kModify, "/etc/passwd") + Line(kAttr, At("gone2")) +
          Line(kRename, At("gone4"), At("gone3")) + "not json\n" + Line(kCreate, At("there")));
  EXPECT_EQ(OnDisk(), Indexed());
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
    EXPECT_EQ(OnDisk(), Indexed());
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
  EXPECT_EQ(OnDisk(), Indexed());
}

TEST_F(ShareWorkerTest, MissingIndexIsMadeAndFilled) {
  test::WriteFile(At("a"), "1");
  index->exists = false;
  worker->RunOnce();
  EXPECT_TRUE(index->exists);
  EXPECT_EQ(OnDisk(), Indexed());
}

TEST_F(ShareWorkerTest, MissingFolderIsNoDeletion) {
  test::WriteFile(At("a"), "1");
  Process(Line(kReindex, root));
  fs::rename(root, root + ".away");
  Queue(Line(kReindex, root));
  EXPECT_THROW(worker->RunOnce(), Error);
  EXPECT_EQ(1U, index->documents.size());
  fs::rename(root + ".away", root);
}

}  // namespace
}  // namespace ferrox::indexd
