#pragma once

#include <unistd.h>

#include <filesystem>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "common/json_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "platform/host/share_table.h"
#include "sdk/share.h"
#include "services/fileindexd/share_worker.h"
#include "tests/indexd/fake_index.h"
#include "tests/support/temp_dir.h"

namespace ferrox::indexd {

namespace fs = std::filesystem;
using test::FakeIndex;

inline constexpr unsigned kModify = 0x2, kAttr = 0x4, kCreate = 0x40, kDelete = 0x80, kRename = 0x100, kCrashed = 0x200,
                          kReindex = 0x10000, kUpdateCfg = 0x20000;

inline std::string Line(unsigned event, const std::string& path, const std::string& path_old = "",
                        bool is_dir = false) {
  Json::Value line;
  line["event"] = event;
  line["path"] = path;
  line["path_old"] = path_old;
  line["is_dir"] = is_dir;
  return toString(line) + "\n";
}

/// Folders below a share's root, "" for the root, with the letters of the kinds that are on ("davp").
using Folders = std::vector<std::pair<std::string, std::string>>;

inline void Configure(const std::string& share, const Folders& folders, bool paused = false) {
  fileindex::FolderMgr folder_mgr;
  folder_mgr.DeleteByShare(share);
  for (const auto& [path, kinds] : folders) {
    const auto on = [&kinds = kinds](char kind) { return kinds.find(kind) != std::string::npos; };
    std::shared_ptr<fileindex::Folder> change;
    folder_mgr.Upsert(change, std::make_shared<fileindex::Folder>("/" + share + path, "name", on('d'), on('a'), on('v'),
                                                                  on('p'), false, paused));
  }
  folder_mgr.Save();
}

/// A share in a fresh folder, indexed as a whole unless Configure says otherwise; its worker, and an index in memory.
class WorkerTest : public testing::Test {
 protected:
  void SetUp() override {
    share = "s" + std::to_string(++last_share);
    root = fs::canonical(folder.Path()).string() + "/" + share;
    fs::create_directory(root);
    kova::host::AddShare({share, root, "#recycle"});
    queue_path = sdk::SDKShare(share).GetQueuePath();
    SetFolders({{"", "davp"}});
    worker = MakeWorker();
  }

  void TearDown() override {
    worker.reset();
    Configure(share, {});
    kova::host::RemoveShare(share);
  }

  std::unique_ptr<ShareWorker> MakeWorker() {
    WorkerEnvironment environment{pool, pause, [this](const std::string&) {
                                    auto fake = std::make_unique<FakeIndex>();
                                    fake->documents = kept;
                                    index = fake.get();
                                    return fake;
                                  }};
    environment.gather_time = std::chrono::milliseconds(0);
    environment.patience = patience;
    environment.early_write_interval = early_write_interval;
    environment.is_mount_point = is_mount_point;
    environment.describe_share = describe_share;
    environment.volume_poll = std::chrono::milliseconds(20);
    return std::make_unique<ShareWorker>(share, environment);
  }

  /// Another process in the place of the first, which stopped where it was.
  void Restart() {
    kept = index->documents;
    worker = MakeWorker();
  }

  void SetFolders(const Folders& folders) {
    configured = folders;
    Configure(share, folders);
  }
  void Queue(const std::string& lines) { test::WriteFile(queue_path, test::ReadFile(queue_path) + lines); }
  void Process(const std::string& lines) {
    Queue(lines);
    worker->RunOnce();
  }
  /// For a worker that was started.
  void WaitForState(const std::string& state) {
    for (int i = 0; i < 6000 && worker->Status()["state"] != state; ++i) usleep(10000);
    ASSERT_EQ(state, worker->Status()["state"].asString());
  }
  std::string At(const std::string& name) const { return root + "/" + name; }

  /// What the index holds: "folder/", "file=content", or "file" alone where no content was wanted.
  std::set<std::string> Indexed() const {
    std::set<std::string> found;
    for (const auto& [path, document] : index->documents) {
      const std::string name = path.substr(std::min(path.size(), root.size() + 1));
      found.insert(fs::is_directory(path) ? name + "/" : document.with_content ? name + "=" + document.content : name);
    }
    return found;
  }

  /// What it must hold, told as plainly as can be.
  std::set<std::string> Expected() const {
    std::set<std::string> expected;
    for (const auto& entry : fs::recursive_directory_iterator(root)) {
      const std::string name = entry.path().string().substr(root.size() + 1);
      const std::string* kinds = nullptr;
      size_t depth = 0;
      for (const auto& [path, letters] : configured) {
        const bool governs = ("/" + name + "/").compare(0, path.size() + 1, path + "/") == 0;
        if (!governs || (kinds != nullptr && path.size() < depth)) continue;
        kinds = &letters;
        depth = path.size();
      }
      if (kinds == nullptr) continue;
      static const std::map<std::string, char> letters = {
          {"", 'd'}, {".txt", 'd'}, {".mp3", 'a'}, {".mkv", 'v'}, {".jpg", 'p'}};
      const auto letter = letters.find(entry.path().extension());
      const bool wanted = letter == letters.end() || kinds->find(letter->second) != std::string::npos;
      expected.insert(entry.is_directory() ? name + "/" : wanted ? name + "=" + test::ReadFile(entry.path()) : name);
    }
    return expected;
  }

  static inline int last_share = 0;
  const test::TempDir folder;
  const InterruptibleClock clock;
  TaskPool pool{2};
  PauseState pause;
  std::chrono::milliseconds patience{0};
  std::chrono::milliseconds early_write_interval{3600 * 1000};
  IsMountPoint is_mount_point = &NothingMounted;
  DescribeShare describe_share = [](const std::string&) { return std::nullopt; };
  std::string share, root, queue_path;
  Folders configured;
  std::map<std::string, FakeIndex::Document> kept;
  FakeIndex* index = nullptr;
  std::unique_ptr<ShareWorker> worker;
};

}  // namespace ferrox::indexd
