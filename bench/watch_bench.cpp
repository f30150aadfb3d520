// Watching many folders one by one: how long it takes until all are watched, and what each costs in this process's
// memory (the kernel's own share, about 1 KiB a folder, is not in it). The folders lie in a fresh temporary folder, a
// hundred in each but the last level, with names of 13 bytes.
//
//   watch_bench --folders 100000 --port inotify|inode

#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "services/kovanotifyd/folders/fan_inode_port.h"
#include "services/kovanotifyd/folders/folder_watcher.h"
#include "services/kovanotifyd/folders/inotify_port.h"

namespace {

using ferrox::notifyd::Change;
using ferrox::notifyd::FolderWatcher;

struct Listener : ferrox::notifyd::WatchListener {
  void OnChange(Change) override {}
  void OnCovered(const std::string&) override { covered = true; }
  void OnRefused(const std::string&, const std::string& reason) override {
    fprintf(stderr, "refused: %s\n", reason.c_str());
    exit(1);
  }
  void OnLost() override {}
  void OnRootDisturbed(const std::string&) override {}
  void OnCookie() override {}

  bool covered = false;
};

uint64_t ResidentBytes() {
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);) {
    if (line.compare(0, 6, "VmRSS:") == 0) return std::stoull(line.substr(6)) * 1024;
  }
  return 0;
}

std::unique_ptr<FolderWatcher> MakeWatcher(bool inode) {
  std::string problem;
  std::unique_ptr<ferrox::notifyd::FolderPort> port;
  if (inode) {
    ferrox::notifyd::FanGroup group;
    problem = group.Open();
    port = std::make_unique<ferrox::notifyd::FanInodePort>(std::move(group));
  } else {
    auto inotify = std::make_unique<ferrox::notifyd::InotifyPort>();
    problem = inotify->Open();
    port = std::move(inotify);
  }
  if (!problem.empty()) {
    fprintf(stderr, "%s\n", problem.c_str());
    exit(1);
  }
  return std::make_unique<FolderWatcher>(std::move(port), FolderWatcher::Options{});
}

/// A hundred folders in each, breadth first, `count` in all with the top.
void MakeFolders(const std::string& top, uint64_t count) {
  std::vector<std::string> parents = {top};
  uint64_t made = 1;
  for (size_t at = 0; made < count; ++at) {
    for (int i = 0; i < 100 && made < count; ++i, ++made) {
      char name[32];
      snprintf(name, sizeof(name), "/folder-%06d", static_cast<int>(made));
      parents.push_back(parents[at] + name);
      std::filesystem::create_directory(parents.back());
    }
  }
}

}  // namespace

int main(int argc, char** argv) {
  uint64_t folders = 100000;
  bool inode = false;
  for (int i = 1; i + 1 < argc; i += 2) {
    if (strcmp(argv[i], "--folders") == 0) folders = strtoull(argv[i + 1], nullptr, 10);
    if (strcmp(argv[i], "--port") == 0) inode = strcmp(argv[i + 1], "inode") == 0;
  }
  std::string top = std::filesystem::temp_directory_path().string() + "/watch-XXXXXX";
  if (mkdtemp(top.data()) == nullptr) return 1;
  if (fork() == 0) {  // so that what making them takes is not in this process's memory
    MakeFolders(top, folders);
    _exit(0);
  }
  (void)wait(nullptr);
  const auto watcher = MakeWatcher(inode);
  Listener listener;
  const uint64_t before = ResidentBytes();
  const auto begin = std::chrono::steady_clock::now();
  watcher->Add({top, {}});
  while (watcher->Advance(std::chrono::milliseconds(20), listener)) (void)watcher->Read(listener);
  const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - begin;
  const uint64_t bytes = ResidentBytes() - before;
  const uint64_t watches = watcher->Watches(top);
  printf("%s: %llu watches in %.2f s, %.1f bytes a folder\n", watcher->Name(), static_cast<unsigned long long>(watches),
         seconds.count(), static_cast<double>(bytes) / watches);
  std::filesystem::remove_all(top);
  return listener.covered && watches == folders ? 0 : 1;
}
