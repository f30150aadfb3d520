#include <malloc.h>

#include <cstdio>
#include <cstring>

#include <kova/log.h>

#include "base/files.h"
#include "common/error.h"
#include "common/paths.h"
#include "services/kovacontentextractd/extractor.h"
#include "services/support/daemon.h"
#include "services/support/frame_server.h"

namespace {

using namespace ferrox;

constexpr char kHelp[] =
    "usage: kovacontentextractd [--help | --version]\n"
    "Reads text and metadata out of files, by workers that can do nothing else, in the foreground, until SIGTERM or\n"
    "SIGINT. FERROX_ROOT chooses the instance, FERROX_LIBEXEC the folder of the workers.\n";

/// For the questions about the daemon's state, which come while all workers are busy.
constexpr unsigned kSpareThreads = 2;
/// For those that a file system may hold that does not answer.
constexpr unsigned kHeldThreads = 8;

/// A client keeps its connection for the next file, and with it the memory for texts.
constexpr std::chrono::seconds kIdleConnection(10);

/// What a large text took is kept for the next one while there is work; the pool gives it back at its end.
void KeepMemoryForTexts() {
  (void)mallopt(M_ARENA_MAX, 2);
  (void)mallopt(M_MMAP_THRESHOLD, 8 << 20);
  (void)mallopt(M_TRIM_THRESHOLD, 32 << 20);
}

/// @throws Error kInternal when the workers are not installed.
extract::WorkerPool::Options PoolOptions() {
  using namespace kova::content;
  if (ProgramFolder().empty()) {
    throw Error(Error::kInternal, std::string(ProgramName(Program::kGeneral)) +
                                      " is not installed beside this program; set FERROX_LIBEXEC to its folder");
  }
  extract::WorkerPool::Options options;
  for (int i = 0; i < kPrograms; ++i) {
    options.programs[static_cast<size_t>(i)] = ProgramFolder() + "/" + ProgramName(static_cast<Program>(i));
  }
  options.empty_folder = InstancePath("/var/run/kovacontentextractd.empty");
  (void)base::MakeFolders(options.empty_folder, 0555);
  return options;
}

/// As many threads as files may be opened at a time, so that those that hang in a file system leave others to work.
void Serve() {
  services::Daemon daemon("kovacontentextractd");
  const extract::WorkerPool::Options pool_options = PoolOptions();
  services::OpenLimit::Options limit;
  limit.at_once = pool_options.workers_max + kHeldThreads;
  extract::Extractor extractor(pool_options, limit);
  services::FrameServerOptions options;
  options.socket_path = InstancePath(kContentExtractdSocket);
  options.workers = limit.at_once + kSpareThreads;
  options.idle_timeout = kIdleConnection;
  options.takes_descriptors = true;
  options.on_stop = [&extractor] { extractor.Stop(); };
  options.on_end = &extract::FreeTextMemory;
  services::FrameServer server(options, [&extractor](const std::string& request, const services::Peer& peer) {
    return extractor.Handle(request, peer);
  });
  daemon.NotifyReady();
  server.Run(daemon.StopFd());
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 2 && strcmp(argv[1], "--help") == 0) return fputs(kHelp, stdout) < 0 ? 3 : 0;
  if (argc == 2 && strcmp(argv[1], "--version") == 0) return printf("kovacontentextractd %s\n", FERROX_VERSION) < 0;
  if (argc != 1) return fputs(kHelp, stderr) < 0 ? 3 : 2;
  try {
    KeepMemoryForTexts();
    Serve();
    return 0;
  } catch (const std::exception& error) {
    (void)fprintf(stderr, "kovacontentextractd: %s\n", kova::WithoutControlCharacters(error.what()).c_str());
    return 3;
  }
}
