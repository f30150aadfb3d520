// Reads, parses and folds a queue of N lines into an operation tree (OPTree's constructor), N = 100,000 and 1,000,000:
//
//   OneFolder     modifications of N distinct files of one folder
//   ManyFolders   ... of distinct files in 50,000 folders, in an order that changes the folder with every line
//   HotFiles      ... of 1,000 files of one folder, again and again
//   FolderEvents  ... of distinct files in 1,000 folders; every 100th line renames or reindexes one of the folders
//
// A line looks as the notification daemon writes it and has about 110 bytes. One thread; the queue is in the page
// cache. Time is the processor time of the constructor alone, on a heap that was given back before, so that fresh pages
// count. Beside it, per workload:
//
//   items_per_second  lines folded in a second
//   bytes_per_op      heap in use by the tree, over the operations that it hands out
//   destroy_ns        time to destroy the tree, per line
//   json_ns           per line, a loop that only reads and parses each line with one reused JsonCpp reader, in this run
//   x_json            how many times faster the tree is than that loop
//
// AboveIdle takes a tree with a million files in one folder, covered by a reindex and so idle, and times further
// events: one file modified, the folder renamed, the folder reindexed, a thousand times over. Time is per three events.

#include <malloc.h>
#include <stdlib.h>
#include <time.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <optional>
#include <string>

#include <benchmark/benchmark.h>
#include <json/reader.h>

#include "fileindex/optree/optree.h"

namespace {

using ferrox::fileindex::OPTree;

enum Workload { kOneFolder, kManyFolders, kHotFiles, kFolderEvents };

std::string Line(int event, const std::string& path, const std::string& path_old = "") {
  const bool is_folder = event != 2;
  return "{\"event\":" + std::to_string(event) + ",\"is_dir\":" + (is_folder ? "true" : "false") + ",\"path\":\"" +
         path + "\",\"path_old\":\"" + path_old + "\",\"data\":null}\n";
}

std::string Folder(int64_t number) { return "/volume1/photo/album_" + std::to_string(100000 + number); }

std::string LineOf(Workload workload, int64_t i) {
  const std::string file = "/IMG_" + std::to_string(10000000 + i) + ".jpg";
  switch (workload) {
    case kOneFolder:
      return Line(2, Folder(0) + file);
    case kManyFolders:
      return Line(2, Folder(i * 7919 % 50000) + file);
    case kHotFiles:
      return Line(2, Folder(0) + "/IMG_" + std::to_string(10000000 + i * 7919 % 1000) + ".jpg");
    case kFolderEvents:
      break;
  }
  const std::string folder = Folder(i * 7919 % 1000);
  if (i % 100 != 99) return Line(2, folder + file);
  return i % 200 == 99 ? Line(0x100, folder + "_new", folder) : Line(0x10000, folder);
}

/// A queue file of the workload, removed with the object.
class Queue {
 public:
  Queue(Workload workload, int64_t lines) {
    std::string pattern = std::filesystem::temp_directory_path() / "optree_bench-XXXXXX";
    folder_ = mkdtemp(pattern.data());
    std::ofstream stream(Path());
    for (int64_t i = 0; i < lines; ++i) stream << LineOf(workload, i);
  }
  ~Queue() { std::filesystem::remove_all(folder_); }

  std::string Path() const { return folder_ + "/queue"; }

 private:
  std::string folder_;
};

/// The processor time of this thread so far: other programs beside it do not count.
double ThreadSeconds() {
  struct timespec now = {};
  (void)clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

template <typename Function>
double SecondsOf(Function function) {
  const double start = ThreadSeconds();
  function();
  return ThreadSeconds() - start;
}

void ParseOnly(const std::string& path) {
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  std::ifstream stream(path);
  Json::Value value;
  for (std::string line; std::getline(stream, line);) {
    benchmark::DoNotOptimize(reader->parse(line.data(), line.data() + line.size(), &value, nullptr));
  }
}

size_t HeapInUse() {
  const struct mallinfo2 info = mallinfo2();
  return info.uordblks + info.hblkhd;
}

void Fold(benchmark::State& state, Workload workload) {
  const int64_t lines = state.range(0);
  const Queue queue(workload, lines);
  const double json = SecondsOf([&queue] { ParseOnly(queue.Path()); });
  double fold = 0;
  double destroy = 0;
  for (auto _ : state) {
    const size_t before = HeapInUse();
    std::optional<OPTree> tree;
    const double seconds = SecondsOf([&] { tree.emplace(queue.Path()); });
    state.SetIterationTime(seconds);
    fold += seconds;
    const size_t bytes = HeapInUse() - before;
    size_t handed_out = 0;
    tree->ProcessOP([&handed_out](const std::shared_ptr<ferrox::fileindex::OP>&) { ++handed_out; });
    state.counters["bytes_per_op"] = static_cast<double>(bytes) / static_cast<double>(handed_out);
    destroy += SecondsOf([&tree] { tree.reset(); });
    (void)malloc_trim(0);
  }
  const double folded = static_cast<double>(state.iterations()) * static_cast<double>(lines);
  state.SetItemsProcessed(state.iterations() * lines);
  state.counters["destroy_ns"] = destroy * 1e9 / folded;
  state.counters["json_ns"] = json * 1e9 / static_cast<double>(lines);
  state.counters["x_json"] = json / static_cast<double>(lines) / (fold / folded);
}

void AboveIdle(benchmark::State& state) {
  const Queue queue(kOneFolder, 1000000);
  OPTree tree(queue.Path());
  std::string folder = Folder(0);
  const auto insert = [&tree](const std::string& line) {
    tree.InsertEvent(std::make_shared<ferrox::fileindex::Event>(line));
  };
  insert(Line(0x10000, folder));
  int64_t i = 0;
  for (auto _ : state) {
    insert(Line(2, folder + "/IMG_" + std::to_string(10000000 + i) + ".jpg"));
    const std::string renamed = Folder(++i);
    insert(Line(0x100, renamed, folder));
    insert(Line(0x10000, renamed));
    folder = renamed;
  }
}

void Sizes(benchmark::internal::Benchmark* benchmark) {
  benchmark->Arg(100000)->Arg(1000000)->UseManualTime()->Unit(benchmark::kMillisecond);
}

BENCHMARK_CAPTURE(Fold, OneFolder, kOneFolder)->Apply(Sizes);
BENCHMARK_CAPTURE(Fold, ManyFolders, kManyFolders)->Apply(Sizes);
BENCHMARK_CAPTURE(Fold, HotFiles, kHotFiles)->Apply(Sizes);
BENCHMARK_CAPTURE(Fold, FolderEvents, kFolderEvents)->Apply(Sizes);
BENCHMARK(AboveIdle)->Iterations(1000);

}  // namespace

BENCHMARK_MAIN();
