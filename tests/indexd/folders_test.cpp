// Catches documents that a change of the indexed folders leaves, loses, or reads again needlessly.
#include <algorithm>
#include <thread>

#include "base/path.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/status_mgr.h"
#include "services/fileindexd/path_rules.h"
#include "tests/indexd/worker_test.h"

namespace ferrox::indexd {
namespace {

/// Configurations of the tree below, from nothing over nested ones to the whole share.
const Folders kConfigurations[] = {
    {},
    {{"", "davp"}},
    {{"", "p"}},
    {{"", "dav"}, {"/d", "p"}},
    {{"/d", "davp"}},
    {{"/d/deep", "d"}},
    {{"/d", ""}, {"/d/deep", "davp"}, {"/d/deep/e", "a"}},
    {{"/d-x", "davp"}, {"/missing/far", "d"}, {"/f.txt", "d"}},
    {{"/d/deep/e", "v"}, {"/d-x", "d"}},
};

class FoldersTest : public WorkerTest {
 protected:
  void MakeTree() {
    for (const std::string place : {"", "d/", "d/deep/", "d/deep/e/", "d-x/", "d0/"}) {
      for (const char* name : {"f.txt", "f.mp3", "f.mkv", "f.jpg", "f.other", "f"}) {
        test::WriteFile(At(place + name), place + name);
      }
    }
  }

  /// As many documents have been written as there are now and were not `before`.
  void ExpectOnlyWhatDiffers(const std::set<std::string>& before) const {
    const std::set<std::string> after = Expected();
    EXPECT_EQ(after, Indexed());
    const auto differs = [&before](const std::string& document) { return before.count(document) == 0; };
    int written = 0;
    for (const auto& [path, times] : index->upserts) written += times;
    EXPECT_EQ(std::count_if(after.begin(), after.end(), differs), written);
  }
  size_t FilesWritten() const {
    size_t files = 0;
    for (const auto& [path, times] : index->upserts) files += fs::is_directory(path) ? 0 : 1;
    return files;
  }
  void StartWith(const Folders& folders) {
    SetFolders(folders);
    kept.clear();
    worker = MakeWorker();
    Process(Line(kReindex, root));
    ASSERT_EQ(Expected(), Indexed());
    index->upserts.clear();
  }
  void RenameTo(const std::string& new_share, const std::string& new_root) {
    Configure(share, {});
    fs::rename(root, new_root);
    kova::host::RenameShare(share, new_share, new_root);
    share = new_share;
    root = new_root;
    queue_path = sdk::SDKShare(share).GetQueuePath();
  }
};

TEST_F(FoldersTest, EachChangeOfFoldersTouchesExactlyWhatDiffers) {
  MakeTree();
  for (const Folders& before : kConfigurations) {
    for (const Folders& after : kConfigurations) {
      SCOPED_TRACE(testing::PrintToString(before) + " -> " + testing::PrintToString(after));
      StartWith(before);
      const std::set<std::string> indexed_before = Indexed();
      SetFolders(after);
      std::string lines;
      for (const Folders* folders : {&before, &after}) {
        for (const auto& [path, kinds] : *folders) lines += Line(kUpdateCfg, root + path);
      }
      Process(lines);
      ExpectOnlyWhatDiffers(indexed_before);
    }
  }
}

/// The list of folders, which the operations and other programs ask, and the folders that the daemon holds of a share.
TEST_F(FoldersTest, TheListAndTheDaemonDecideAlike) {
  for (const Folders& configuration : kConfigurations) {
    SCOPED_TRACE(testing::PrintToString(configuration));
    SetFolders(configuration);
    const fileindex::FolderMgr list;
    const ShareFolders held = ShareFolders::Load(share, root);
    const ShareFolders stored = ShareFolders::FromJson(held.ToJson());
    for (const std::string below : {"", "/d", "/d/deep", "/d/deep/e/further", "/d-x", "/d0", "/f.txt", "/missing"}) {
      for (const std::string name : {"", "/f.txt", "/f.mp3", "/f.mkv", "/f.jpg", "/f.other"}) {
        const std::string path = root + below + name;
        for (const ShareFolders* folders : {&held, &stored}) {
          EXPECT_EQ(folders->PlaceOf(path) == ShareFolders::Place::kIndexed, list.IsFullPathIndexed(path)) << path;
          EXPECT_EQ(folders->WantsContent(path), list.IsFullPathNeedMeta(path)) << path;
        }
      }
    }
  }
}

TEST_F(FoldersTest, RenameAcrossAnyBorder) {
  struct Row {
    const char* from;
    const char* to;
  };
  const Row rows[] = {{"d", "moved"},         {"d-x", "d/x"},         {"d/deep", "up"},         {"d/deep/e", "d-x/e"},
                      {"d0", "missing"},      {"d/f.txt", "d/f.jpg"}, {"f.mp3", "d/g.mp3"},     {"d-x/f", "here"},
                      {"d/deep", "d-x/deep"}, {"d0/f.txt", "d0.txt"}, {"d/deep/f.jpg", "p.jpg"}};
  for (const Folders& folders : kConfigurations) {
    for (const Row& row : rows) {
      SCOPED_TRACE(testing::PrintToString(folders) + ": " + row.from + " -> " + row.to);
      fs::remove_all(root);
      MakeTree();
      StartWith(folders);
      fs::rename(At(row.from), At(row.to));
      Process(Line(kRename, At(row.to), At(row.from), fs::is_directory(At(row.to))));
      EXPECT_EQ(Expected(), Indexed());
    }
  }
}

TEST_F(FoldersTest, SingleEventsKeepToTheFolders) {
  MakeTree();
  for (const Folders& folders : kConfigurations) {
    SCOPED_TRACE(testing::PrintToString(folders));
    StartWith(folders);
    std::string lines;
    for (const char* name : {"f.txt", "d/f.jpg", "d/deep/f.mp3", "d/deep/e/f.mkv", "d-x/f.other", "d0/f"}) {
      test::WriteFile(At(name), std::string("changed ") + name);
      lines += Line(kModify, At(name)) + Line(kAttr, At("d/deep"));
    }
    fs::remove(At("d/deep/f.txt"));
    Process(lines + Line(kDelete, At("d/deep/f.txt")));
    EXPECT_EQ(Expected(), Indexed());
    MakeTree();
  }
}

/// Else their documents would go.
TEST_F(FoldersTest, FoldersOfAShareThatIsNotToBeFoundAreNotLeftOut) {
  MakeTree();
  const ShareFolders folders = ShareFolders::Load(share, root);
  kova::host::RemoveShare(share);
  services::Exclusions exclusions(root, folders.Exclusions());
  PathRules rules(share, root, folders, exclusions);
  for (const char* name : {"d", "d/f.txt", "gone/f.txt"}) EXPECT_THROW(rules.PlaceOf(At(name)), Error) << name;
  kova::host::AddShare({share, root});
}

/// The share table names it anew before the folders do.
TEST_F(FoldersTest, InnerShareThatIsRenamedIsNotReadMeanwhile) {
  MakeTree();
  kova::host::AddShare({"d", At("d")});
  Configure("d", {{"", "davp"}});
  patience = std::chrono::minutes(5);
  worker = MakeWorker();
  Process(Line(kReindex, root));
  fs::rename(At("d"), At("n"));
  kova::host::RenameShare("d", "n", At("n"));
  std::thread folders_follow([this] {
    while (!fs::exists(fileindex::DetachedQueuePath(queue_path))) usleep(1000);
    usleep(50000);  // in which a pass that does not wait reads
    const fileindex::FolderMgr folder_mgr;
    for (const auto& entry : folder_mgr.GetFolders()) entry->SetShare(entry->GetShare() == "d" ? "n" : share);
    folder_mgr.Save();
  });
  try {
    worker->RunOnce();
  } catch (const Interrupted&) {
    // It begins anew with these folders.
  }
  folders_follow.join();
  worker->RunOnce();
  for (const auto& [path, times] : index->upserts) EXPECT_FALSE(base::IsAtOrBelow(path, At("n"))) << path;
  Configure("n", {});
  kova::host::RemoveShare("n");
}

/// The library takes a reindex that is being carried out for one that covers the new configuration.
TEST_F(FoldersTest, ChangeInTheMiddleOfAReindexIsNotLost) {
  MakeTree();
  for (const unsigned event : {kReindex, kCrashed}) {
    for (const Folders& after : kConfigurations) {
      SCOPED_TRACE(testing::PrintToString(after));
      SetFolders({{"/d", "davp"}});
      kept.clear();
      worker = MakeWorker();
      int writes = 0;
      index->before_write = [this, &writes, &after](const std::string&) {
        if (++writes == 5) SetFolders(after);
      };
      Process(Line(event, root));
      EXPECT_EQ(Expected(), Indexed());
      EXPECT_EQ(0, fileindex::StatusMgr().GetShareStatus(share));
    }
  }
}

TEST_F(FoldersTest, ChangeSwallowedByAReindexElsewhereIsMadeUpFor) {
  MakeTree();
  StartWith({{"/d", "davp"}});
  fs::rename(At("d"), At("new"));
  SetFolders({{"/new", "davp"}});
  Process(Line(kReindex, At("d")) + Line(kReindex, At("new")));
  EXPECT_EQ(Expected(), Indexed());
  EXPECT_EQ(0U, FilesWritten()) << "they went along";
}

/// Whoever changed the folders died before the event was queued, or could not reach the daemon.
TEST_F(FoldersTest, ChangeThatNobodyTellsOfIsCarriedOut) {
  MakeTree();
  for (const Folders& before : {kConfigurations[1], kConfigurations[3], kConfigurations[6]}) {
    for (const Folders& after : kConfigurations) {
      SCOPED_TRACE(testing::PrintToString(before) + " -> " + testing::PrintToString(after));
      StartWith(before);
      const std::set<std::string> indexed_before = Indexed();
      Restart();
      SetFolders(after);
      worker->Start();
      WaitForState("idle");
      ExpectOnlyWhatDiffers(indexed_before);
    }
  }
}

/// The index has been given the share's new name; its documents still have the paths of before.
TEST_F(FoldersTest, RenamedShareTakesItsDocumentsAlong) {
  const std::string old_root = root;
  const std::string old_share = share;
  for (const unsigned event : {kRename, kReindex, 0U}) {
    for (const Folders& folders : kConfigurations) {
      SCOPED_TRACE(testing::PrintToString(folders) + " event " + std::to_string(event));
      MakeTree();
      StartWith(folders);
      kept = index->documents;
      for (const char* stray : {"0", "-x", "/old", ".elsewhere/stray"}) kept[root + stray] = {};
      RenameTo(old_share + "new", old_root + "new");
      SetFolders(folders);
      worker = MakeWorker();
      if (event != 0) Queue(Line(event, root, old_root));
      worker->Start();
      WaitForState("idle");
      EXPECT_EQ(Expected(), Indexed());
      EXPECT_EQ(0U, FilesWritten()) << "files are not read again, whatever the worker hears of first";
      worker.reset();
      RenameTo(old_share, old_root);
    }
  }
}

}  // namespace
}  // namespace ferrox::indexd
