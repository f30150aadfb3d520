// The list of indexed folders, 1,000 of them in 10 shares unless said otherwise, on the host platform in an instance of
// its own below the temporary folder. A folder's full path has about 60 bytes and 6 components; every fifth folder lies
// in another one.
//
//   LookUp       GetMostSuitableCfg for 10,000 files in turn, two thirds of which lie in some folder
//   LinearScan   the same question answered by comparing the path with every folder, for the same files
//   Load         FolderMgr(); parse_ms is JsonCpp's time alone for the text of the file
//   Save         FolderMgr::Save; write_ms is a plain write and fsync of the same bytes to a file of the same folder
//   Upsert       an empty list gets all the folders, one by one
//   Delete       each of them is deleted, one by one; DeleteByShare: share by share
//   Status/N     the status of each, as a listing with "status" asks, N shares with 100,000 queue lines between them,
//   of
//                which 1 % touch a folder; alone_ms is the time if each were asked alone, reckoned from ten of them
//
// Time is real time. LookUp and LinearScan use the processor alone.

#include <fcntl.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>
#include <json/value.h>

#include "common/file_util.h"
#include "common/json_util.h"
#include "common/new_class.h"
#include "common/paths.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/folders/folder_status.h"
#include "sdk/share.h"

namespace {

namespace fs = std::filesystem;
using namespace ferrox;
using fileindex::Folder;
using fileindex::FolderMgr;
using FolderPtr = std::shared_ptr<Folder>;

constexpr int kFolders = 1000;
constexpr int kShares = 10;
constexpr int kQueueLines = 100000;

std::string ShareName(int number) { return "department_" + std::to_string(number); }

std::string FolderPath(int number, int shares) {
  const std::string share = "/" + ShareName(number % shares);
  const std::string project = "/projects/customer_" + std::to_string(number / 5 * 5) + "/documents";
  return share + project + (number % 5 == 0 ? "" : "/part_" + std::to_string(number % 5));
}

std::vector<FolderPtr> NewFolders(int shares = kShares) {
  std::vector<FolderPtr> folders;
  for (int i = 0; i < kFolders; ++i) {
    folders.push_back(newClass<Folder>(FolderPath(i, shares), "n", true, i % 2 == 0, i % 3 == 0, true, false, false));
  }
  return folders;
}

double Milliseconds(std::chrono::steady_clock::duration duration) {
  return std::chrono::duration<double, std::milli>(duration).count();
}

/// How long `function` takes, the median of nine.
template <typename Function>
double MillisecondsOf(const Function& function) {
  std::vector<double> times;
  for (int i = 0; i < 9; ++i) {
    const auto start = std::chrono::steady_clock::now();
    function();
    times.push_back(Milliseconds(std::chrono::steady_clock::now() - start));
  }
  std::nth_element(times.begin(), times.begin() + 4, times.end());
  return times[4];
}

/// A fresh instance with ten shares, and all the folders in them.
class Instance {
 public:
  Instance() {
    std::string pattern = fs::temp_directory_path() / "folder_bench-XXXXXX";
    root_ = mkdtemp(pattern.data());
    (void)setenv("FERROX_ROOT", root_.c_str(), 1);
    Json::Value table(Json::arrayValue);
    for (int i = 0; i < kShares; ++i) {
      Json::Value share;
      share["name"] = ShareName(i);
      share["path"] = root_ + "/volume1/" + ShareName(i);
      table.append(share);
    }
    for (const char* folder : {"/etc/kova", kConfigurationFolder, "/tmp"}) fs::create_directories(InstancePath(folder));
    if (!toFile(table, InstancePath("/etc/kova/shares.json"))) abort();
    for (int i = 0; i < kFolders; ++i) {
      fs::create_directories(root_ + "/volume1" + FolderPath(i, kShares));
      fs::create_directories(root_ + "/volume1" + FolderPath(i, 1));
    }
  }
  ~Instance() { fs::remove_all(root_); }

  std::string FullPath(const std::string& share_path) const { return root_ + "/volume1" + share_path; }

 private:
  std::string root_;
};

Instance* g_instance = nullptr;

void FillFile() {
  FolderMgr mgr;
  FolderPtr change;
  for (const FolderPtr& folder : NewFolders()) mgr.Upsert(change, folder);
  mgr.Save();
}

std::vector<std::string> Files() {
  std::mt19937 random(1);
  std::vector<std::string> files;
  for (int i = 0; i < 10000; ++i) {
    const std::string folder = FolderPath(static_cast<int>(random() % kFolders), kShares);
    const bool is_in_folder = random() % 3 != 0;
    files.push_back(g_instance->FullPath(is_in_folder ? folder : Dirname(Dirname(Dirname(folder)))) + "/IMG_" +
                    std::to_string(i) + ".jpg");
  }
  return files;
}

void LookUp(benchmark::State& state) {
  FillFile();
  const FolderMgr mgr;
  const std::vector<std::string> files = Files();
  size_t i = 0;
  for (auto _ : state) benchmark::DoNotOptimize(mgr.GetMostSuitableCfg(files[i++ % files.size()]));
  state.SetItemsProcessed(state.iterations());
}

void LinearScan(benchmark::State& state) {
  FillFile();
  const FolderMgr mgr;
  std::vector<std::string> beginnings;
  for (const FolderPtr& folder : mgr.GetFolders()) beginnings.push_back(folder->GetFullPath() + "/");
  const std::vector<std::string> files = Files();
  size_t i = 0;
  for (auto _ : state) {
    const std::string path = files[i++ % files.size()] + "/";
    FolderPtr best;
    size_t longest = 0;
    for (size_t k = 0; k < beginnings.size(); ++k) {
      if (beginnings[k].size() <= longest || !StringStartWith(path, beginnings[k])) continue;
      best = mgr.GetFolders()[k];
      longest = beginnings[k].size();
    }
    if (best != mgr.GetMostSuitableCfg(files[(i - 1) % files.size()])) abort();
    benchmark::DoNotOptimize(best);
  }
  state.SetItemsProcessed(state.iterations());
}

void Load(benchmark::State& state) {
  FillFile();
  std::string text;
  if (!ReadWholeFile(InstancePath(kFileIndexFoldersCfgPath), text)) abort();
  for (auto _ : state) benchmark::DoNotOptimize(FolderMgr().GetFolders().size());
  state.counters["parse_ms"] = MillisecondsOf([&text] {
    Json::Value value;
    benchmark::DoNotOptimize(fromString(value, text));
  });
  state.counters["bytes"] = static_cast<double>(text.size());
}

void Save(benchmark::State& state) {
  FillFile();
  const FolderMgr mgr;
  for (auto _ : state) mgr.Save();
  const std::string path = InstancePath(kFileIndexFoldersCfgPath);
  std::string text;
  if (!ReadWholeFile(path, text)) abort();
  state.counters["write_ms"] = MillisecondsOf([&] {
    const int fd = open((path + ".plain").c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    if (write(fd, text.data(), text.size()) != static_cast<ssize_t>(text.size()) || fsync(fd) != 0) abort();
    (void)close(fd);
  });
}

void Upsert(benchmark::State& state) {
  (void)Unlink(InstancePath(kFileIndexFoldersCfgPath));
  for (auto _ : state) {
    state.PauseTiming();
    const std::vector<FolderPtr> folders = NewFolders();
    state.ResumeTiming();
    FolderMgr mgr;
    FolderPtr change;
    for (const FolderPtr& folder : folders) mgr.Upsert(change, folder);
  }
}

template <typename Function>
void EmptyList(benchmark::State& state, const Function& empty) {
  FillFile();
  for (auto _ : state) {
    state.PauseTiming();
    FolderMgr mgr;
    (void)mgr.IsFullPathIndexed("/");
    state.ResumeTiming();
    empty(mgr);
    if (!mgr.GetFolders().empty()) abort();
  }
}

void Delete(benchmark::State& state) {
  EmptyList(state, [](FolderMgr& mgr) {
    FolderPtr change;
    for (int i = 0; i < kFolders; ++i) mgr.Delete(change, FolderPath(i, kShares));
  });
}

void DeleteByShare(benchmark::State& state) {
  EmptyList(state, [](FolderMgr& mgr) {
    for (int i = 0; i < kShares; ++i) mgr.DeleteByShare(ShareName(i));
  });
}

void FillQueues(int shares) {
  for (int share = 0; share < shares; ++share) {
    std::ofstream queue(sdk::SDKShare(ShareName(share)).GetQueuePath(), std::ios::trunc);
    const std::string folder = g_instance->FullPath("/" + ShareName(share));
    for (int i = 0; i < kQueueLines / shares; ++i) {
      const int touched = (i / 100 * shares + share) % (kFolders / 2);
      const std::string place = i % 100 == 99 ? g_instance->FullPath(FolderPath(touched, shares)) : folder;
      queue << R"({"event":2,"is_dir":false,"path":")" << place << "/file_" << i
            << R"(.jpg","path_old":"","data":null})"
            << "\n";
    }
  }
}

void Status(benchmark::State& state) {
  const int shares = static_cast<int>(state.range(0));
  FillFile();
  FillQueues(shares);
  const std::vector<FolderPtr> folders = NewFolders(shares);
  Json::Value additionals(Json::arrayValue);
  additionals.append("status");
  int processing = 0;
  for (auto _ : state) {
    processing = 0;
    fileindex::FolderStatus status(folders);
    for (const FolderPtr& folder : folders) {
      const Json::Value data = status.GetDataWithAdditional(*folder, additionals);
      const std::string text = data["additional"]["status"]["text"].asString();
      if (text != "processing" && text != "finished") abort();
      processing += text == "processing" ? 1 : 0;
    }
  }
  double alone = 0;
  for (int i = 0; i < 10; ++i) {
    alone += MillisecondsOf([&] { benchmark::DoNotOptimize(folders[i * 97]->GetDataWithAdditional(additionals)); });
  }
  state.counters["alone_ms"] = alone * kFolders / 10;
  state.counters["processing"] = processing;
}

BENCHMARK(LookUp);
BENCHMARK(LinearScan);
BENCHMARK(Load)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(Save)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(Upsert)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(Delete)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(DeleteByShare)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(Status)->Arg(1)->Arg(kShares)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
  Instance instance;
  g_instance = &instance;
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  return 0;
}
