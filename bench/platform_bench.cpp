// What the host's platform costs where the library calls it often, in an instance of its own below the temporary
// folder:
//
//   ShareGet/N        KOVAShareGet and KOVAShareFree of one of N shares in the table
//   SambaShareGet/N   the same when the N shares come from Samba (a scripted testparm)
//   NamePathGet/N     KOVAShareNamePathGet of a path six folders deep in one of N shares
//   ShareEnum/N       KLIBShareEnum of N shares
//   Register/N        MonitorQueue::Upsert of a queue with N watched folders, each time another mask: durably written
//   RegisterAgain/N   ... as it is registered already
//   RegisterAmong/N   ... with one watched folder, beside N other queues
//   ReadRegistry/N    the reader of N registrations with one folder each
//   SmbConfSwitch/N   the text of N sections with six lines each, parsed and switched in half of them
//   StartServices     SetupRelatedServices(true) where the index daemon runs already and there is no Samba
//
// One thread. Files are in the page cache; what is written durably waits for the disk.
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include <benchmark/benchmark.h>
#include <json/value.h>
#include <json/writer.h>

#include <kova/notifyd.h>
#include <kova/share.h>

#include "common/log.h"
#include "fileindex/operations/related_services.h"
#include "platform/host/log.h"
#include "platform/host/notify_registry.h"
#include "platform/host/samba_shares.h"
#include "platform/host/share_table.h"
#include "platform/host/smb_conf.h"

namespace {

std::string g_root;

void Write(const std::string& path, const std::string& text) {
  std::filesystem::create_directories(std::filesystem::path(path).parent_path());
  std::ofstream(path) << text;
}

std::string ShareName(int64_t number) { return "share number " + std::to_string(number); }
std::string SharePath(int64_t number) { return "/volume1/shares/" + ShareName(number); }

void MakeTable(int64_t shares) {
  Json::Value table(Json::arrayValue);
  for (int64_t i = 0; i < shares; ++i) {
    Json::Value entry;
    entry["name"] = ShareName(i);
    entry["path"] = SharePath(i);
    table.append(entry);
  }
  Write(g_root + "/etc/kova/kova.json", "{}");
  Write(kova::host::ShareTablePath(), Json::writeString(Json::StreamWriterBuilder(), table));
  kova::host::ExpectSambaChange();
}

void GetShare(benchmark::State& state) {
  for (auto _ : state) {
    KOVAShare* share = nullptr;
    if (KOVAShareGet(ShareName(state.range(0) / 2).c_str(), &share) < 0) state.SkipWithError("no such share");
    KOVAShareFree(share);
  }
}

void ShareGet(benchmark::State& state) {
  MakeTable(state.range(0));
  GetShare(state);
}
BENCHMARK(ShareGet)->Arg(10)->Arg(1000);

std::string Sections(int64_t count) {
  std::string text = "[global]\n workgroup = WG\n";
  for (int64_t i = 0; i < count; ++i) {
    text += "[" + ShareName(i) + "]\n path = " + SharePath(i) + "\n read only = no\n comment = x\n guest ok = no\n";
    text += " spotlight = " + std::string(i % 2 == 0 ? "yes" : "no") + "\n hide unreadable = yes\n";
  }
  return text;
}

void SambaShareGet(benchmark::State& state) {
  MakeTable(0);
  Write(g_root + "/etc/samba/smb.conf", Sections(state.range(0)));
  Write(g_root + "/testparm", "#!/bin/sh\nexec cat \"$3\"\n");
  std::filesystem::permissions(g_root + "/testparm", std::filesystem::perms(0755));
  Write(g_root + "/etc/kova/kova.json", R"({"samba": {"shares": true, "testparm": ")" + g_root + "/testparm\"}}");
  kova::host::ExpectSambaChange();
  GetShare(state);
  std::filesystem::remove_all(g_root + "/etc/samba");
}
BENCHMARK(SambaShareGet)->Arg(10)->Arg(1000);

void NamePathGet(benchmark::State& state) {
  MakeTable(state.range(0));
  const std::string path = SharePath(state.range(0) / 2) + "/one/two/three/four/five/six.jpg";
  char name[492], share_path[4096];
  for (auto _ : state) {
    const int got = KOVAShareNamePathGet(path.c_str(), name, sizeof(name), share_path, sizeof(share_path));
    if (got < 0) state.SkipWithError("no such share");
  }
}
BENCHMARK(NamePathGet)->Arg(10)->Arg(1000);

void ShareEnum(benchmark::State& state) {
  MakeTable(state.range(0));
  for (auto _ : state) {
    KLIBCSzList* list = KLIBCSzListAlloc(1024);
    if (KLIBShareEnum(&list, nullptr) != state.range(0)) state.SkipWithError("shares are missing");
    KLIBCSzListFree(list);
  }
}
BENCHMARK(ShareEnum)->Arg(10)->Arg(1000);

bool Upsert(const std::string& queue, int64_t folders, unsigned mask) {
  Json::Value document;
  document["queue"] = queue;
  document["config"] = Json::arrayValue;
  for (int64_t i = 0; i < folders; ++i) {
    Json::Value watch;
    watch["path"] = SharePath(1) + "/folder " + std::to_string(i);
    watch["mask"] = mask;
    watch["ignore"].append("@eaDir");
    document["config"].append(watch);
  }
  using KOVA::KOVANOTIFYD::MonitorQueue;
  return MonitorQueue::Upsert(MonitorQueue(document), "fileindex", 1);
}

void Register(benchmark::State& state) {
  unsigned mask = 0;
  for (auto _ : state) {
    if (!Upsert("/queue/of/a/share", state.range(0), ++mask)) state.SkipWithError("not registered");
  }
}
BENCHMARK(Register)->Arg(1)->Arg(1000)->Unit(benchmark::kMillisecond)->UseRealTime();

void RegisterAgain(benchmark::State& state) {
  for (auto _ : state) {
    if (!Upsert("/queue/of/a/share", state.range(0), 1)) state.SkipWithError("not registered");
  }
}
BENCHMARK(RegisterAgain)->Arg(1)->Arg(1000)->Unit(benchmark::kMillisecond)->UseRealTime();

void MakeRegistry(int64_t queues) {
  std::filesystem::remove_all(kova::host::RegistryFolder());
  for (int64_t i = 0; i < queues; ++i) (void)Upsert("/queue/number/" + std::to_string(i), 1, 1);
}

void RegisterAmong(benchmark::State& state) {
  MakeRegistry(state.range(0));
  unsigned mask = 0;
  for (auto _ : state) {
    if (!Upsert("/queue/of/a/share", 1, ++mask)) state.SkipWithError("not registered");
  }
}
BENCHMARK(RegisterAmong)->Arg(1000)->Unit(benchmark::kMillisecond)->UseRealTime();

void ReadRegistry(benchmark::State& state) {
  MakeRegistry(state.range(0));
  for (auto _ : state) {
    const auto registrations = kova::host::ReadRegistrations();
    if (static_cast<int64_t>(registrations.list.size()) != state.range(0)) state.SkipWithError("some are missing");
  }
}
BENCHMARK(ReadRegistry)->Arg(10)->Arg(1000)->Unit(benchmark::kMillisecond);

void SmbConfSwitch(benchmark::State& state) {
  const std::string text = Sections(state.range(0));
  std::vector<std::string> names;
  for (int64_t i = 0; i < state.range(0); ++i) names.push_back(ShareName(i));
  for (auto _ : state) {
    const std::string changed = kova::host::SmbConf(text).WithSwitch(names, "spotlight", true);
    if (changed == text) state.SkipWithError("nothing was switched");
  }
}
BENCHMARK(SmbConfSwitch)->Arg(10)->Arg(1000)->Unit(benchmark::kMillisecond);

void StartServices(benchmark::State& state) {
  MakeTable(1000);
  ferrox::fileindex::SetupRelatedServices(true);
  for (auto _ : state) ferrox::fileindex::SetupRelatedServices(true);
  ferrox::fileindex::SetupRelatedServices(false);
}
BENCHMARK(StartServices)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
  std::string pattern = std::filesystem::temp_directory_path() / "platform-bench-XXXXXX";
  if (mkdtemp(pattern.data()) == nullptr) return 1;
  g_root = pattern;
  (void)setenv("FERROX_ROOT", g_root.c_str(), 1);
  (void)ferrox::SetLogSink([](int, const char*) {});
  kova::host::SetLogSink([](int, const char*) {});
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  std::filesystem::remove_all(g_root);
  return 0;
}
