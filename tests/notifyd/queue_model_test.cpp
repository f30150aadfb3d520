// Catches changed paths that nobody looks at again, in random orders of changes, failures and readers.
#include <atomic>
#include <filesystem>
#include <map>
#include <random>
#include <set>
#include <thread>

#include <gtest/gtest.h>

#include "base/path.h"
#include "fileindex/optree/optree.h"
#include "fileindex/queue/queue_mgr.h"
#include "services/kovanotifyd/queues/folder_cover.h"
#include "services/kovanotifyd/queues/queue_router.h"
#include "tests/support/temp_dir.h"

namespace ferrox::notifyd {

namespace {

using fileindex::FileIndexOP;
using fileindex::OP;
using std::chrono::milliseconds;
using Kind = Change::Kind;

enum Look { kNone, kAttributes, kContent, kAllBelow };

/// How much of its path the index daemon looks at for an operation; of a rename and a delete, at what is there now.
Look LookOf(FileIndexOP op) {
  if (op == fileindex::OP_ATTR) return kAttributes;
  return op == fileindex::OP_UPSERT ? kContent : kAllBelow;
}

/// What a queue's reader still has to look at, because it changed after it was looked at last. `files` tells, by path,
/// whether what is there is a folder.
class Reader {
 public:
  using Files = std::map<std::string, bool>;

  Reader(std::string queue, std::vector<std::string> roots, const Files& files)
      : queue_(std::move(queue)), roots_(std::move(roots)), files_(files), known_(files) {}

  void Expect(const std::string& path, Look look) {
    if (path.find("/@eaDir") != std::string::npos) return;
    for (const std::string& root : roots_) {
      if (base::IsAtOrBelow(path, root)) expected_[path] = std::max(expected_[path], look);
    }
  }
  void Process() {
    fileindex::QueueMgr queue(queue_);
    (void)queue.ProcessOP(
        [this](const std::shared_ptr<OP>& op) {
          LookAt(op->node->GetPath(), LookOf(op->op));
          if (op->op == fileindex::OP_RENAME) LookAt(op->path, kAllBelow);
        },
        true);
    queue.DeleteTmp();
    known_ = files_;
  }
  std::string Missed() const {
    std::string text;
    for (const auto& [path, look] : expected_) text += path + ":" + std::to_string(look) + " ";
    return text;
  }

 private:
  static bool IsFolder(const Files& files, const std::string& path) {
    const auto found = files.find(path);
    return found != files.end() && found->second;
  }
  void LookAt(const std::string& at, Look look) {
    // Nothing is below what is no folder, and nothing is known to have been there.
    if (look == kContent && !IsFolder(files_, at) && !IsFolder(known_, at)) look = kAllBelow;
    (void)std::erase_if(expected_, [&](const auto& expected) {
      return look == kAllBelow ? base::IsAtOrBelow(expected.first, at)
                               : expected.first == at && expected.second <= look;
    });
  }

  std::string queue_;
  std::vector<std::string> roots_;
  const Files& files_;
  Files known_;  ///< at the last processing
  std::map<std::string, Look> expected_;
};

class QueueModelTest : public testing::Test {
 protected:
  QueueModelTest() { std::filesystem::create_directory(dir_ / "box"); }

  unsigned Random(size_t below) { return static_cast<unsigned>(random_() % below); }
  /// A path of `parts` components below "/v".
  std::string Path(unsigned parts) {
    const char* const kNames[] = {"/a", "/b", "/c", "/ab", "/a-", "/@eaDir"};
    std::string path = "/v";
    for (; parts > 0; --parts) path += kNames[Random(6)];
    return path;
  }
  std::string AnyPath() { return Path(Random(30) == 0 ? 1 : 2 + Random(4)); }

  void NewRouter() {
    QueueRouter::Options options;
    options.held_max = Random(3) == 0 ? 10000 : 3 + Random(150);
    options.queue_bytes_max = 4000;
    router_ = std::make_unique<QueueRouter>(options);
    const std::vector<std::string> ignore = {"@eaDir"};
    router_->SetQueues(
        {{dir_ / "box/1", {{"/v/a", 0xFFC6, ignore}, {"/v/a/b", 0xFFC6, ignore}, {"/v/b", 0xFFC6, ignore}}},
         {dir_ / "box/2", {{"/v/ab", 0xFEC6, ignore}, {"/v/c", 0xFFC6, ignore}}}});
  }
  /// What a watcher tells of a change, and what it makes the readers look at.
  void Put(Kind kind, bool is_folder, const std::string& path, const std::string& old_path = "") {
    const Look look = kind == Kind::kAttributes ? kAttributes : is_folder ? kAllBelow : kContent;
    for (const std::string& changed : {path, old_path}) {
      for (Reader& reader : readers_) reader.Expect(changed, look);
    }
    router_->Put({kind, is_folder, path, old_path}, now_);
  }
  void Delete(const std::string& path) {
    const std::map<std::string, bool> before = files_;
    for (auto at = before.rbegin(); at != before.rend(); ++at) {
      if (!base::IsAtOrBelow(at->first, path)) continue;
      files_.erase(at->first);
      Put(Kind::kDeleted, at->second, at->first);
    }
  }
  void Rename(const std::string& from, const std::string& to) {
    const bool is_folder = files_[from];
    if (base::IsAtOrBelow(to, from) || !CanAppear(to) || (files_.count(to) != 0 && (is_folder || files_[to]))) return;
    files_.erase(to);
    std::map<std::string, bool> moved;
    for (const auto& [path, kind] : files_)
      moved[base::IsAtOrBelow(path, from) ? to + path.substr(from.size()) : path] = kind;
    files_ = moved;
    Put(Kind::kRenamed, is_folder, to, from);
  }
  bool CanAppear(const std::string& path) const {
    const auto parent = files_.find(path.substr(0, path.rfind('/')));
    return parent != files_.end() && parent->second;
  }
  void ChangeAny() {
    const std::string path = Random(3) == 0 ? AnyPath() : std::next(files_.begin(), Random(files_.size()))->first;
    if (path == "/v") return;
    const auto found = files_.find(path);
    if (found == files_.end()) {
      if (!CanAppear(path)) return;
      files_[path] = Random(2) == 0;
      return Put(Kind::kCreated, files_[path], path);
    }
    const unsigned what = Random(found->second ? 20 : 6);
    if (what == 0) return Delete(path);
    if (what == 1 || what == 2) return Rename(path, AnyPath());
    if (what == 3) return Put(Kind::kAttributes, found->second, path);
    if (!found->second) return Put(what == 4 ? Kind::kModified : Kind::kWritten, false, path);
  }
  void Step() {
    now_ += milliseconds(Random(100));
    const unsigned what = Random(100);
    if (what < 85) return ChangeAny();
    if (what < 96) return (void)router_->Flush(now_);
    if (what < 98) return readers_[what % 2].Process();
    // The queues' folder is taken away, so that nothing can be appended, or comes back.
    std::filesystem::rename(dir_ / (is_away_ ? "away" : "box"), dir_ / (is_away_ ? "box" : "away"));
    is_away_ = !is_away_;
  }
  void Settle() {
    if (is_away_) std::filesystem::rename(dir_ / "away", dir_ / "box");
    is_away_ = false;
    for (int i = 0; i < 2; ++i) {
      (void)router_->FlushAll(now_);
      for (Reader& reader : readers_) reader.Process();
    }
  }

  const char* const wanted_seed_ = getenv("FERROX_SEED");
  const unsigned seed_ = wanted_seed_ != nullptr ? static_cast<unsigned>(atoll(wanted_seed_)) : std::random_device()();
  const testing::ScopedTrace trace_{__FILE__, __LINE__, "seed " + std::to_string(seed_)};
  std::mt19937 random_{seed_};
  test::TempDir dir_;
  std::unique_ptr<QueueRouter> router_;
  QueueRouter::TimePoint now_{milliseconds(1000000)};
  bool is_away_ = false;
  Reader::Files files_ = {{"/v", true}, {"/v/a", true}, {"/v/ab", true}, {"/v/b", true}, {"/v/c", true}};
  Reader readers_[2] = {{dir_ / "box/1", {"/v/a", "/v/b"}, files_}, {dir_ / "box/2", {"/v/ab", "/v/c"}, files_}};
};

}  // namespace

TEST_F(QueueModelTest, EachChangedPathIsLookedAt) {
  for (int round = 0; round < 300; ++round) {
    NewRouter();
    for (unsigned step = Random(300); step > 0; --step) Step();
    Settle();
    for (const Reader& reader : readers_) ASSERT_EQ(reader.Missed(), "") << "round " << round;
  }
}

TEST_F(QueueModelTest, FewFoldersCoverMany) {
  for (int round = 0; round < 300; ++round) {
    std::vector<ComparedFolder> folders;
    std::set<std::string> roots;
    for (unsigned count = 1 + Random(200); count > 0; --count) {
      const std::string path = Path(2 + Random(4));
      folders.push_back({path, path.find('/', path.find('/', 1) + 1)});
      roots.insert(path.substr(0, folders.back().root_size));
    }
    const size_t most = 1 + Random(20);
    const std::vector<ComparedFolder> cover = CoverFolders(folders, most);
    EXPECT_LE(cover.size(), std::max(most, roots.size()));
    for (const ComparedFolder& folder : folders) {
      EXPECT_EQ(std::count_if(cover.begin(), cover.end(),
                              [&](const ComparedFolder& over) { return base::IsAtOrBelow(folder.path, over.path); }),
                1)
          << folder.path;
    }
    for (const ComparedFolder& folder : cover) EXPECT_GE(folder.path.size(), folder.root_size);
  }
}

TEST_F(QueueModelTest, NoLineIsLostWhileTheQueueIsDetached) {
  constexpr int kFiles = 20000;
  const std::string queue = dir_ / "box/1";
  std::set<std::string> seen;
  std::atomic<bool> is_done = false;
  std::thread reader([&] {
    for (bool last = false; !last;) {
      last = is_done;
      fileindex::QueueMgr mgr(queue);
      (void)mgr.ProcessOP([&seen](const std::shared_ptr<OP>& op) { seen.insert(op->node->GetPath()); }, true);
      mgr.DeleteTmp();
    }
  });
  QueueRouter router{QueueRouter::Options()};
  router.SetQueues({{queue, {{"/v/p", 0xFFC6, {}}}}});
  for (int i = 0; i < kFiles; ++i) {
    router.Put({Kind::kWritten, false, "/v/p/" + std::to_string(i)}, now_);
    if (i % 7 == 0) (void)router.Flush(now_ += milliseconds(1));
  }
  while (!router.FlushAll(now_).empty()) {
  }
  is_done = true;
  reader.join();
  EXPECT_EQ(seen.size(), static_cast<size_t>(kFiles));
  EXPECT_EQ(router.Figures()[queue].written, static_cast<uint64_t>(kFiles));
}

}  // namespace ferrox::notifyd
