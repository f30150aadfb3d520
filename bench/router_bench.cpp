// Changes through the notification daemon's QueueRouter into a queue file, flushed after every 1,000 changes as its
// event loop does. One thread; the file is in the page cache and detached, as the index daemon does, every 100,000
// lines. items_per_second counts changes, `lines` is how many lines came of each.
//
//   Burst      distinct files of 1,000 folders are closed after writing: each change is a line
//   Unpack     a file is created, written twice and closed: four changes, one line
//   Replace    a file is created beside, written, closed and renamed over its old version: two lines
//   RemoveTree files of 100 folders are deleted, each folder after its 1,000 files
//   Moves      folders are made, filled, renamed and removed
//   Nested/N   N folders, each in the one before, are deleted from the deepest up: bytes_per_second counts their paths,
//              and is about the same for each N
//
// OneFolder watches one folder for one queue, ManyFolders 1,000 for each of 10. Held has a queue that cannot be
// appended to, so that changes become comparisons.

#include <stdlib.h>

#include <chrono>
#include <filesystem>
#include <map>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>

#include "services/kovanotifyd/queues/queue_router.h"

namespace {

using ferrox::notifyd::Change;
using ferrox::notifyd::QueueRouter;
using ferrox::notifyd::QueueWatch;
using Kind = Change::Kind;

constexpr int64_t kFlushEvery = 1000;
constexpr int64_t kDetachEvery = 100;

std::string Folder(int64_t number) { return "/volume1/photo/album_" + std::to_string(100000 + number); }
std::string File(int64_t folder, int64_t i) { return Folder(folder) + "/IMG_" + std::to_string(10000000 + i) + ".jpg"; }

Change Burst(int64_t i) { return {Kind::kWritten, false, File(i * 7919 % 1000, i)}; }
Change Unpack(int64_t i) {
  constexpr Kind kKinds[] = {Kind::kCreated, Kind::kModified, Kind::kModified, Kind::kWritten};
  return {kKinds[i % 4], false, File(i / 4000, i / 4)};
}
Change Replace(int64_t i) {
  constexpr Kind kKinds[] = {Kind::kCreated, Kind::kModified, Kind::kWritten, Kind::kRenamed};
  const std::string path = File(i / 4 % 1000, i / 4);
  const std::string beside = path + ".part";
  return i % 4 == 3 ? Change{Kind::kRenamed, false, path, beside} : Change{kKinds[i % 4], false, beside};
}
Change RemoveTree(int64_t i) {
  const int64_t folder = i / 1001 % 100;
  return i % 1001 == 1000 ? Change{Kind::kDeleted, true, Folder(folder)}
                          : Change{Kind::kDeleted, false, File(folder, i)};
}

Change Moves(int64_t i) {
  const std::string folder = Folder(i / 5 % 300) + "/" + std::to_string(i / 5);
  const Change kChanges[] = {{Kind::kCreated, true, folder},
                             {Kind::kCreated, false, folder + "/file"},
                             {Kind::kRenamed, true, folder + ".new", folder},
                             {Kind::kDeleted, false, folder + ".new/file"},
                             {Kind::kDeleted, true, folder + ".new"}};
  return kChanges[i % 5];
}

using Queues = std::map<std::string, std::vector<QueueWatch>>;

/// A folder for queues, removed with the object.
class QueueFolder {
 public:
  QueueFolder() {
    std::string pattern = std::filesystem::temp_directory_path() / "router_bench-XXXXXX";
    path_ = mkdtemp(pattern.data());
  }
  ~QueueFolder() { std::filesystem::remove_all(path_); }
  std::string Queue(const std::string& name) const { return path_ + "/" + name; }

 private:
  std::string path_;
};

void Run(benchmark::State& state, const Queues& queues, Change (*change_of)(int64_t)) {
  QueueRouter router{QueueRouter::Options()};
  router.SetQueues(queues);
  auto now = QueueRouter::TimePoint::clock::now();
  int64_t changes = 0;
  int64_t flushes = 0;
  for (auto _ : state) {
    router.Put(change_of(changes++), now);
    if (changes % kFlushEvery != 0) continue;
    (void)router.Flush(now += std::chrono::milliseconds(20));
    if (++flushes % kDetachEvery != 0) continue;
    for (const auto& [queue, watches] : queues) (void)remove(queue.c_str());
  }
  uint64_t lines = 0;
  for (const auto& [queue, figures] : router.Figures()) lines += figures.written;
  state.SetItemsProcessed(changes);
  state.counters["lines"] = static_cast<double>(lines) / static_cast<double>(changes);
}

void OneFolder(benchmark::State& state, Change (*change_of)(int64_t)) {
  const QueueFolder folder;
  Run(state, {{folder.Queue("queue"), {{"/volume1/photo", 0xFFC6, {"@eaDir"}}}}}, change_of);
}
BENCHMARK_CAPTURE(OneFolder, Burst, Burst);
BENCHMARK_CAPTURE(OneFolder, Unpack, Unpack);
BENCHMARK_CAPTURE(OneFolder, Replace, Replace);
BENCHMARK_CAPTURE(OneFolder, RemoveTree, RemoveTree);
BENCHMARK_CAPTURE(OneFolder, Moves, Moves);

void Nested(benchmark::State& state) {
  const QueueFolder folder;
  QueueRouter router{QueueRouter::Options()};
  router.SetQueues({{folder.Queue("queue"), {{"/volume1/photo", 0xFFC6, {"@eaDir"}}}}});
  std::vector<Change> changes;
  std::string path = "/volume1/photo";
  for (int64_t i = 0; i < state.range(0); ++i) changes.push_back({Kind::kDeleted, true, path += "/d"});
  int64_t bytes = 0;
  const auto now = QueueRouter::TimePoint::clock::now();
  for (auto _ : state) {
    for (auto change = changes.rbegin(); change != changes.rend(); ++change) {
      bytes += static_cast<int64_t>(change->path.size());
      router.Put(*change, now);
    }
    (void)router.Flush(now);
  }
  state.SetBytesProcessed(bytes);
}
BENCHMARK(Nested)->Arg(500)->Arg(2000)->Arg(8000);

void ManyFolders(benchmark::State& state) {
  const QueueFolder folder;
  Queues queues;
  for (int queue = 0; queue < 10; ++queue) {
    std::vector<QueueWatch>& watches = queues[folder.Queue(std::to_string(queue))];
    for (int64_t i = queue; i < 10000; i += 10) watches.push_back({Folder(i), 0xFFC6, {"@eaDir"}});
  }
  Run(state, queues, Burst);
}
BENCHMARK(ManyFolders);

void Held(benchmark::State& state, Change (*change_of)(int64_t)) {
  const QueueFolder folder;
  Run(state, {{folder.Queue("missing/queue"), {{"/volume1/photo", 0xFFC6, {"@eaDir"}}}}}, change_of);
}
BENCHMARK_CAPTURE(Held, Burst, Burst);
BENCHMARK_CAPTURE(Held, Moves, Moves);

}  // namespace

BENCHMARK_MAIN();
