// What isolation costs. Each file is read by the same reader in this process, with all that ParseFile does besides
// (examining the file, telling its type, making the document), and by ParseFile, with daemon and worker. All processes
// share one processor, so what is told is microseconds of it for each file; where that is allowed, others at work
// cannot take it. "--starts": what it takes to start each worker program and have a first worker of it (and to end
// them), and to have another one.
//
// bench/extract_bench.py makes the files, and compares with the tools of the same libraries.

#include <fcntl.h>
#include <malloc.h>
#include <sched.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <string>
#include <vector>

#include <json/value.h>

#include <kova/content_extract.h>
#include <kova/content_type.h>
#include <kova/service.h>

#include "base/unique_fd.h"
#include "common/file_util.h"
#include "services/kovacontentextractd/readers/archive.h"
#include "services/kovacontentextractd/readers/audio.h"
#include "services/kovacontentextractd/readers/electronic_book.h"
#include "services/kovacontentextractd/readers/mail.h"
#include "services/kovacontentextractd/readers/office_open.h"
#include "services/kovacontentextractd/readers/old_office.h"
#include "services/kovacontentextractd/readers/open_document.h"
#include "services/kovacontentextractd/readers/pdf/pdf.h"
#include "services/kovacontentextractd/readers/photo/photo.h"
#include "services/kovacontentextractd/readers/rich_text.h"
#include "services/kovacontentextractd/readers/text_files.h"
#include "services/kovacontentextractd/readers/video/video.h"
#include "services/kovacontentextractd/worker_process.h"
#include "services/kovacontentextractd/worker_template.h"

namespace {

using namespace ferrox;
using namespace ferrox::extract;
using SteadyClock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kTimeForAFile(1500);
constexpr size_t kRunsMin = 9;

struct Row {
  const char* name;
  Reader reader;
};
constexpr Row kReaders[] = {
    {"plain", &ReadPlainFile},
    {"html", &ReadHtmlFile},
    {"xml", &ReadXmlFile},
    {"unknown", &ReadUnknownFile},
    {"office", &ReadOfficeOpen},
    {"open-document", &ReadOpenDocument},
    {"book", &ReadElectronicBook},
    {"old-office", &ReadOldOffice},
    {"rich-text", &ReadRichText},
    {"archive", &ReadArchive},
    {"audio", &ReadAudio},
    {"mail", &ReadMail},
    {"pdf", &ReadPdf},
    {"photo", &ReadPhoto},
    {"video", &ReadVideo},
};

Reader ReaderNamed(const char* name) {
  for (const Row& row : kReaders) {
    if (strcmp(row.name, name) == 0) return row.reader;
  }
  return nullptr;
}

void PrepareAll() {
  PrepareTextReaders();
  PrepareArchive();
  PrepareAudio();
  PrepareMail();
  PreparePdf();
  PreparePhoto();
  PrepareVideo();
}

Json::Value Parse(const std::string& path, bool need_meta) {
  Json::Value config, document;
  config["need_meta"] = need_meta;
  KOVA::CONTENT_EXTRACT::ParseFile(path, config, document);
  return document;
}

/// What ParseFile would do if it read the file itself.
Json::Value ReadHere(const std::string& path) {
  Json::Value document = Parse(path, false);
  const base::UniqueFd file(open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
  struct stat info = {};
  std::array<char, kova::content::kHeadBytes> head;
  const ssize_t got = fstat(file.Get(), &info) == 0 ? pread(file.Get(), head.data(), head.size(), 0) : -1;
  if (got <= 0) return {};
  const std::string name = Basename(path), extension = GetFileExtension(name, true);
  const char* type = kova::content::TypeOf(extension, {head.data(), static_cast<size_t>(got)});
  const kova::content::Format* format = type != nullptr ? kova::content::FormatOf(type) : &kova::content::kUnknown;
  const Reader reader = format != nullptr ? ReaderNamed(format->reader) : nullptr;
  if (reader == nullptr) return {};
  Findings findings;
  reader({file.Get(), static_cast<uint64_t>(info.st_size), name, extension}, findings);
  Json::Value found = findings.ToFields();
  for (const auto& field : found.getMemberNames()) document[field] = std::move(found[field]);
  document["KOVAMDTextContent"] = findings.Text();
  return document;
}

Json::Value ReadByParseFile(const std::string& path) { return Parse(path, true); }

using Way = Json::Value (*)(const std::string& path);

double Microseconds(Way way, const std::string& path) {
  const auto begin = SteadyClock::now();
  (void)way(path);
  return std::chrono::duration<double, std::micro>(SteadyClock::now() - begin).count();
}

double Median(std::vector<double>& values) {
  const auto middle = values.begin() + static_cast<ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

/// Both ways by turns, since the processor is not the same for a second.
void Measure(const std::string& path) {
  constexpr Way kWays[] = {&ReadHere, &ReadByParseFile};
  std::vector<double> taken[2];
  if (ReadHere(path)["KOVAMDTextContent"] != ReadByParseFile(path).get("KOVAMDTextContent", "")) {
    (void)fprintf(stderr, "%s: the two ways do not give the same text\n", path.c_str());
    exit(1);
  }
  const auto end = SteadyClock::now() + kTimeForAFile;
  while (taken[0].size() < kRunsMin || SteadyClock::now() < end) {
    for (int way = 0; way < 2; ++way) taken[way].push_back(Microseconds(kWays[way], path));
  }
  (void)printf("%s\t%.1f\t%.1f\n", path.c_str(), Median(taken[0]), Median(taken[1]));
}

void MeasureStarts(const std::string& folder) {
  for (int i = 0; i < kova::content::kPrograms; ++i) {
    const std::string name = kova::content::ProgramName(static_cast<kova::content::Program>(i));
    const std::string program = Dirname(FERROX_WORKER) + "/" + name;
    std::vector<double> first, further;
    for (int run = 0; run < 15; ++run) {
      const auto begin = SteadyClock::now();
      WorkerTemplate prepared(program, folder);
      const WorkerProcess worker(prepared);
      const auto between = SteadyClock::now();
      const WorkerProcess next(prepared);
      first.push_back(std::chrono::duration<double, std::milli>(between - begin).count());
      further.push_back(std::chrono::duration<double, std::milli>(SteadyClock::now() - between).count());
    }
    (void)printf("%s\t%.2f\t%.2f\n", name.c_str(), Median(first), Median(further));
  }
}

/// One processor for this process and those that it starts, and before all others where that is allowed.
void TakeOneProcessor() {
  cpu_set_t one;
  CPU_ZERO(&one);
  CPU_SET(sched_getcpu(), &one);
  (void)sched_setaffinity(0, sizeof(one), &one);
  const sched_param first = {1};
  (void)sched_setscheduler(0, SCHED_FIFO, &first);
}

/// As the workers do, so that none of the two ways asks the kernel for more.
void KeepMemory() {
  (void)mallopt(M_MMAP_THRESHOLD, 32 << 20);
  (void)mallopt(M_TRIM_THRESHOLD, 256 << 20);
}

}  // namespace

int main(int argc, char** argv) {
  char folder[] = "/tmp/extract_bench.XXXXXX";
  if (mkdtemp(folder) == nullptr || setenv("FERROX_ROOT", folder, 1) != 0) return 3;
  KeepMemory();
  TakeOneProcessor();
  (void)setenv("TZ", "UTC0", 1);  // a worker cannot look whether the zone has changed, for each time in an archive
  if (argc == 2 && strcmp(argv[1], "--starts") == 0) {
    MeasureStarts(folder);
  } else {
    PrepareAll();
    for (int i = 1; i < argc; ++i) Measure(argv[i]);
    (void)KLIBServiceStop("kovacontentextractd", 1);
  }
  (void)std::filesystem::remove_all(folder);
  return 0;
}
