// What isolation costs: a text file of 1 KB, 100 KB and 1 MB, of ordinary words in UTF-8, is read by the same reader in
// this process, by a worker, and by ParseFile with daemon and worker. And how long each worker program takes
// from its start to the closed sandbox, and to its end.

#include <fcntl.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include <benchmark/benchmark.h>
#include <json/value.h>

#include <kova/content_extract.h>
#include <kova/content_type.h>
#include <kova/service.h>

#include "common/file_util.h"
#include "common/unique_fd.h"
#include "services/kovacontentextractd/readers/text_files.h"
#include "services/kovacontentextractd/worker_pool.h"
#include "services/kovacontentextractd/worker_process.h"
#include "services/kovacontentextractd/worker_template.h"

namespace {

using namespace ferrox;
using namespace ferrox::extract;

std::string g_folder;

/// A file of about so many bytes.
std::string FileOf(int64_t bytes) {
  const std::string path = g_folder + "/" + std::to_string(bytes) + ".txt";
  std::string text;
  for (int i = 0; text.size() + 16 < static_cast<size_t>(bytes); ++i) text += "wörter" + std::to_string(i) + " und\n";
  if (!IsFileExist(path) && !WriteWholeFile(path, text)) abort();
  return path;
}

void InProcess(benchmark::State& state) {
  const UniqueFd file(open(FileOf(state.range(0)).c_str(), O_RDONLY | O_CLOEXEC));
  for (auto _ : state) {
    Findings findings;
    ReadPlainFile({file.Get(), static_cast<uint64_t>(state.range(0)), "a.txt", "txt"}, findings);
    benchmark::DoNotOptimize(findings.ToDocument());
  }
}

void InWorker(benchmark::State& state) {
  WorkerPool::Options options;
  options.programs[0] = FERROX_WORKER;
  options.empty_folder = g_folder;
  WorkerPool pool(options);
  const UniqueFd file(open(FileOf(state.range(0)).c_str(), O_RDONLY | O_CLOEXEC));
  for (auto _ : state) {
    std::string text;
    const auto sink = [&text](size_t, std::string_view piece) { text += piece; };
    benchmark::DoNotOptimize(pool.Read(kova::content::Program::kGeneral, {file.Get(), "plain", "txt", "a.txt"}, sink));
  }
}

void ByParseFile(benchmark::State& state) {
  const std::string path = FileOf(state.range(0));
  Json::Value config, document;
  config["need_meta"] = true;
  for (auto _ : state) {
    KOVA::CONTENT_EXTRACT::ParseFile(path, config, document);
    if (!document.isMember("KOVAMDTextContent")) state.SkipWithError("not read");
  }
}

void StartOfAWorker(benchmark::State& state) {
  const std::string name = kova::content::ProgramName(static_cast<kova::content::Program>(state.range(0)));
  const std::string program = Dirname(FERROX_WORKER) + "/" + name;
  state.SetLabel(name);
  WorkerTemplate prepared(program, g_folder);
  const WorkerProcess first(prepared);
  for (auto _ : state) {
    const WorkerProcess worker(prepared);
    benchmark::DoNotOptimize(worker.Missing());
  }
}

void StartOfATemplate(benchmark::State& state) {
  const std::string name = kova::content::ProgramName(static_cast<kova::content::Program>(state.range(0)));
  state.SetLabel(name);
  for (auto _ : state) {
    WorkerTemplate prepared(Dirname(FERROX_WORKER) + "/" + name, g_folder);
    const WorkerProcess worker(prepared);
  }
}

void Sizes(benchmark::internal::Benchmark* one) {
  one->Arg(1000)->Arg(100000)->Arg(1000000)->Unit(benchmark::kMicrosecond)->UseRealTime();
}

BENCHMARK(InProcess)->Apply(Sizes);
BENCHMARK(InWorker)->Apply(Sizes);
BENCHMARK(ByParseFile)->Apply(Sizes);
BENCHMARK(StartOfATemplate)->DenseRange(0, kova::content::kPrograms - 1)->Unit(benchmark::kMicrosecond)->UseRealTime();
BENCHMARK(StartOfAWorker)->DenseRange(0, kova::content::kPrograms - 1)->Unit(benchmark::kMicrosecond)->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
  char folder[] = "/tmp/extract_bench.XXXXXX";
  if (mkdtemp(folder) == nullptr || setenv("FERROX_ROOT", folder, 1) != 0) return 3;
  g_folder = folder;
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  (void)KLIBServiceStop("kovacontentextractd", 1);
  (void)std::filesystem::remove_all(folder);
  return 0;
}
