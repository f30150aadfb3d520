// A worker program whose readers do what none should; the name of the reader is the misdeed.

#include <fcntl.h>
#include <linux/fs.h>
#include <linux/futex.h>
#include <sched.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cstdlib>
#include <iterator>
#include <string>
#include <vector>

#include "services/kovacontentextractd/sandbox.h"
#include "services/kovacontentextractd/worker.h"
#include "services/kovacontentextractd/worker_protocol.h"

using namespace ferrox::extract;

namespace {

uint32_t g_number = 0;  ///< of the request being answered

template <Reader kReader>
void Counted(const Source& source, Findings& findings) {
  ++g_number;
  kReader(source, findings);
}

void Count(const Source&, Findings& findings) {
  static int count = 0;
  findings.AddText(std::to_string(++count));
}

void Crash(const Source&, Findings&) { abort(); }

void BeKilled(const Source&, Findings&) { (void)raise(SIGKILL); }

/// Waits for a word that the daemon never says.
void Hang(const Source&, Findings&) {
  char byte;
  (void)!read(kWorkerSocket, &byte, 1);
}

void Spin(const Source&, Findings&) {
  LimitCpuTime(1);
  for (std::atomic<unsigned> turns = 0;;) ++turns;
}

void Devour(const Source&, Findings& findings) {
  std::vector<std::string> eaten;
  for (int i = 0; i < 1000; ++i) eaten.emplace_back(size_t{1} << 20, static_cast<char>(i));
  findings.AddText(std::to_string(eaten.size()));
}

void Announce(uint32_t json_bytes, uint32_t text_bytes = 0) {
  const AnswerHeader header = {json_bytes, text_bytes, g_number};
  (void)!write(kWorkerSocket, &header, sizeof(header));
}

void AnnounceTooMuch(const Source&, Findings&) { Announce(UINT32_MAX); }

void BabbleForEver(const Source&, Findings&) {
  Announce(kAnswerMaxBytes);
  for (const std::string noise(65536, 'x'); write(kWorkerSocket, noise.data(), noise.size()) > 0;) {
  }
}

void AnswerBytes(const Source& source, Findings&) {
  std::string bytes(source.size, '\0');
  (void)!pread(source.fd, bytes.data(), bytes.size(), 0);
  Announce(static_cast<uint32_t>(bytes.size()));
  (void)!write(kWorkerSocket, bytes.data(), bytes.size());
}

void AnnounceLongText(const Source&, Findings&) {
  Announce(2, UINT32_MAX);
  (void)!write(kWorkerSocket, "{}", 2);
}

void AnswerTwice(const Source&, Findings& findings) {
  const std::string extra = "{\"KOVAMDTitle\":\"of another file\"}";
  Announce(static_cast<uint32_t>(extra.size()));
  (void)!write(kWorkerSocket, extra.data(), extra.size());
  findings.Set("KOVAMDTitle", "late");
}

void AnswerByHalves(const Source&, Findings&) {
  (void)!write(kWorkerSocket, "\x10\0\0", 3);
  (void)close(kWorkerSocket);
  for (;;) (void)sched_yield();
}

/// Slower than anybody waits, but never silent.
void AnswerInDrips(const Source&, Findings&) {
  Announce(kAnswerMaxBytes);
  for (;;) {
    (void)!write(kWorkerSocket, "{", 1);
    for (int i = 0; i < 1000; ++i) (void)sched_yield();
  }
}

void AnswerAnother(const Source&, Findings& findings) {
  g_number += 6;
  Announce(0);
  findings.AddText("late");
}

/// What an idle worker says, nobody hears.
void GoOnTalking(const Source&, Findings&) {
  Announce(2);
  (void)!write(kWorkerSocket, "{}", 2);
  for (const std::string noise(4096, '\0'); write(kWorkerSocket, noise.data(), noise.size()) > 0;) {
  }
}

void AnswerAndLeave(const Source&, Findings&) {
  Announce(2);
  (void)!write(kWorkerSocket, "{}", 2);
  _exit(0);
}

bool Executes(void* page) { return page != MAP_FAILED; }

/// Lists what of the forbidden works.
void TryToEscape(const Source& source, Findings& findings) {
  const auto report = [&findings](const char* name, bool possible) {
    if (possible) findings.Append("KOVAMDComment", name);
  };
  const int memory = PROT_READ | PROT_WRITE;
  void* const page = mmap(nullptr, 4096, memory, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  const rlimit more = {RLIM_INFINITY, RLIM_INFINITY};
  struct flock lock = {};
  lock.l_type = F_RDLCK;
  uint32_t word = 0;
  struct stat info;
  report("open", open("/etc/passwd", O_RDONLY) >= 0);
  report("open a folder", open("/", O_RDONLY | O_DIRECTORY) >= 0);
  report("create", creat("/tmp/kova_escape", 0600) >= 0);
  report("create here", openat(AT_FDCWD, "kova_escape", O_CREAT | O_WRONLY, 0600) >= 0);
  report("stat", stat("/etc/passwd", &info) == 0);
  report("unlink", unlink("/tmp/kova_escape") == 0);
  report("write the file", write(source.fd, "x", 1) > 0);
  report("socket", socket(AF_INET, SOCK_STREAM, 0) >= 0);
  report("Unix socket", socket(AF_UNIX, SOCK_STREAM, 0) >= 0);
  report("socketpair", syscall(SYS_socketpair, AF_UNIX, SOCK_STREAM, 0, nullptr) == 0);
  report("memory file", syscall(SYS_memfd_create, "x", 0) >= 0);
  report("fork", syscall(SYS_clone, SIGCHLD, nullptr, nullptr, nullptr, nullptr) >= 0);
  report("exec", execl("/bin/true", "true", nullptr) == 0);
  report("executable memory", Executes(mmap(nullptr, 4096, memory | PROT_EXEC, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0)));
  report("executable file", Executes(mmap(nullptr, 4096, PROT_READ | PROT_EXEC, MAP_PRIVATE, source.fd, 0)));
  report("memory made executable", mprotect(page, 4096, PROT_READ | PROT_EXEC) == 0);
  report("kill", kill(getppid(), 0) == 0);
  report("trace", ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) == 0);
  report("be signalled", fcntl(source.fd, F_SETOWN, getpid()) == 0 || fcntl(source.fd, F_SETSIG, SIGKILL) == 0 ||
                             fcntl(source.fd, F_SETFL, O_ASYNC) == 0 || fcntl(source.fd, F_SETLEASE, F_RDLCK) == 0);
  report("lock the file", fcntl(source.fd, F_OFD_SETLK, &lock) == 0);
  report("lend priority", syscall(SYS_futex, &word, FUTEX_LOCK_PI, 0, nullptr, nullptr, 0) == 0);
  report("merge memory", !kSanitized && madvise(page, 4096, MADV_MERGEABLE) == 0);
  report("signals of a socket", ioctl(kWorkerSocket, FIOASYNC, &lock) == 0);
  report("process options", prctl(PR_SET_DUMPABLE, 1) == 0);
  report("limits", setrlimit(RLIMIT_AS, &more) == 0);
  report("identity", setuid(0) == 0);
  report("io_uring", syscall(SYS_io_uring_setup, 1, nullptr) >= 0);
  findings.AddText("tried");
}

}  // namespace

int main(int argc, char** argv) {
  static constexpr ReaderRow kReaders[] = {
      {"count", &Counted<Count>},
      {"crash", &Counted<Crash>},
      {"be killed", &Counted<BeKilled>},
      {"hang", &Counted<Hang>},
      {"spin", &Counted<Spin>},
      {"devour", &Counted<Devour>},
      {"announce", &Counted<AnnounceTooMuch>},
      {"babble", &Counted<BabbleForEver>},
      {"bytes", &Counted<AnswerBytes>},
      {"long text", &Counted<AnnounceLongText>},
      {"twice", &Counted<AnswerTwice>},
      {"escape", &Counted<TryToEscape>},
      {"halves", &Counted<AnswerByHalves>},
      {"drips", &Counted<AnswerInDrips>},
      {"another", &Counted<AnswerAnother>},
      {"talk", &Counted<GoOnTalking>},
      {"leave", &Counted<AnswerAndLeave>},
  };
  const Worker worker = {kReaders, std::size(kReaders), [] {}};
  return RunWorker(worker, argc > 1 ? argv[1] : nullptr);
}
