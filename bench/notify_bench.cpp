/// What a change costs the notification daemon, by each way of watching, beside a loop that only reads the same
/// kernel interface.
///
/// Workload: another process works in --folders folders (default 1,000) below --scratch (default /dev/shm) for
/// --seconds (default 3): it creates a file, writes it, closes it, renames it into the next folder and deletes it,
/// as fast as it can or with --rate changes a second. That is four changes a file: made, written, renamed, gone.
/// The reader gathers what comes in 25 ms, as the daemon does. "loop" reads the kernel's records and counts them;
/// "watcher" is our Watcher with a listener that counts; "queue" is the watcher with a QueueRouter that appends to
/// a queue file, which is taken away when it has 1 MiB. CPU is the reader's thread alone, "lost" how often the
/// kernel dropped changes. All ways in one run, or --only one of them, --rounds times (default 3) in turn;
/// medians. Without root the first way is left out.

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/fanotify.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/filesystem/filesystem_watcher.h"
#include "services/kovanotifyd/folders/fan_inode_port.h"
#include "services/kovanotifyd/folders/folder_watcher.h"
#include "services/kovanotifyd/folders/inotify_port.h"
#include "services/kovanotifyd/queues/queue_router.h"
#include "services/kovanotifyd/watcher.h"

namespace {

using base::UniqueFd;
using ferrox::notifyd::Change;
using ferrox::notifyd::QueueRouter;
using ferrox::notifyd::Watcher;
using SteadyClock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kBatch{25};
constexpr size_t kBufferBytes = 256 * 1024;
constexpr uint32_t kMask = 65478;
constexpr uint64_t kQueueBytes = 1U << 20;

struct Settings {
  int folders = 1000;
  int rounds = 3;
  double seconds = 3;
  double rate = 0;  ///< changes a second; 0: as fast as it can
  std::string scratch = "/dev/shm";
  std::string only;  ///< a way; "": all

  std::string Root() const { return scratch + "/watched"; }
  std::string Folder(uint64_t number) const {
    return Root() + "/" + std::to_string(number % static_cast<uint64_t>(folders));
  }
};

[[noreturn]] void Die(const std::string& what) {
  (void)fprintf(stderr, "notify_bench: %s: %s\n", what.c_str(), strerror(errno));
  exit(3);
}

/// Ends with the number of changes made, sent through `result`.
[[noreturn]] void Produce(const Settings& settings, int result) {
  uint64_t files = 0;
  const auto begin = SteadyClock::now();
  const auto end = begin + std::chrono::duration<double>(settings.seconds);
  for (; SteadyClock::now() < end; ++files) {
    const std::string made = settings.Folder(files) + "/f" + std::to_string(files) + ".txt";
    const std::string renamed = settings.Folder(files + 1) + "/g" + std::to_string(files) + ".txt";
    const int fd = open(made.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    if (fd < 0 || write(fd, "words\n", 6) != 6 || close(fd) != 0) Die(made);
    if (rename(made.c_str(), renamed.c_str()) != 0 || unlink(renamed.c_str()) != 0) Die(renamed);
    if (settings.rate <= 0) continue;
    const double ahead = static_cast<double>(4 * (files + 1)) / settings.rate -
                         std::chrono::duration<double>(SteadyClock::now() - begin).count();
    if (ahead > 0) usleep(static_cast<useconds_t>(ahead * 1e6));
  }
  files *= 4;
  _exit(write(result, &files, sizeof(files)) == sizeof(files) ? 0 : 1);
}

double ThreadSeconds() {
  timespec time = {};
  (void)clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

/// Something that takes what the kernel reports.
class Reader {
 public:
  virtual ~Reader() = default;
  virtual int Fd() const = 0;
  /// Takes all there is.
  virtual void Take() = 0;
  uint64_t lost = 0;
};

class FanLoop : public Reader {
 public:
  FanLoop(const Settings& settings, bool inode_marks) : buffer_(kBufferBytes) {
    constexpr unsigned kFlags = FAN_CLASS_NOTIF | FAN_CLOEXEC | FAN_NONBLOCK | FAN_REPORT_DFID_NAME_TARGET;
    fd_.Reset(fanotify_init(kFlags, O_RDONLY | O_CLOEXEC));
    if (!fd_.Valid()) Die("fanotify_init");
    constexpr uint64_t kEvents =
        FAN_CREATE | FAN_DELETE | FAN_RENAME | FAN_MODIFY | FAN_CLOSE_WRITE | FAN_ATTRIB | FAN_ONDIR;
    const unsigned scope = inode_marks ? 0 : FAN_MARK_FILESYSTEM;
    const uint64_t children = inode_marks ? FAN_EVENT_ON_CHILD : 0;
    for (int i = 0; i < (inode_marks ? settings.folders : 1); ++i) {
      const std::string folder = settings.Folder(static_cast<uint64_t>(i));
      if (fanotify_mark(fd_.Get(), FAN_MARK_ADD | scope, kEvents | children, AT_FDCWD, folder.c_str()) != 0) {
        Die("fanotify_mark");
      }
    }
  }
  int Fd() const override { return fd_.Get(); }
  void Take() override {
    ssize_t size = 0;
    while ((size = read(fd_.Get(), buffer_.data(), buffer_.size())) > 0) {
      auto* event = reinterpret_cast<fanotify_event_metadata*>(buffer_.data());
      for (; FAN_EVENT_OK(event, size); event = FAN_EVENT_NEXT(event, size)) {
        ++records_;
        if ((event->mask & FAN_Q_OVERFLOW) != 0) ++lost;
      }
    }
  }

 private:
  base::UniqueFd fd_;
  std::vector<char> buffer_;
  uint64_t records_ = 0;
};

class InotifyLoop : public Reader {
 public:
  explicit InotifyLoop(const Settings& settings) : fd_(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)), buffer_(kBufferBytes) {
    constexpr uint32_t kEvents = IN_CREATE | IN_DELETE | IN_MOVE | IN_MODIFY | IN_CLOSE_WRITE | IN_ATTRIB;
    for (int i = 0; i < settings.folders; ++i) {
      const std::string folder = settings.Folder(static_cast<uint64_t>(i));
      if (inotify_add_watch(fd_.Get(), folder.c_str(), kEvents) < 0) Die("inotify_add_watch");
    }
  }
  int Fd() const override { return fd_.Get(); }
  void Take() override {
    ssize_t size = 0;
    while ((size = read(fd_.Get(), buffer_.data(), buffer_.size())) > 0) {
      for (ssize_t at = 0; at < size;) {
        const auto* event = reinterpret_cast<const inotify_event*>(buffer_.data() + at);
        ++records_;
        if ((event->mask & IN_Q_OVERFLOW) != 0) ++lost;
        at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
      }
    }
  }

 private:
  base::UniqueFd fd_;
  std::vector<char> buffer_;
  uint64_t records_ = 0;
};

/// Our watcher, with or without the router behind it.
class WatcherReader : public Reader, private ferrox::notifyd::WatchListener {
 public:
  WatcherReader(const Settings& settings, std::unique_ptr<Watcher> watcher, bool with_queue)
      : queue_(settings.scratch + "/the.queue"), watcher_(std::move(watcher)) {
    if (with_queue) {
      router_ = std::make_unique<QueueRouter>(QueueRouter::Options{});
      router_->SetQueues({{queue_, {{settings.Root(), kMask, {"@eaDir"}}}}});
    }
    watcher_->Add({settings.Root(), {"@eaDir"}});
    for (int i = 0; i < 10000 && !covered_; ++i) (void)watcher_->Advance(kBatch, *this);
    if (!covered_) Die(std::string(watcher_->Name()) + " does not watch: " + refusal_);
  }
  int Fd() const override { return watcher_->Fd(); }
  void Take() override {
    while (watcher_->Read(*this)) {
    }
    (void)watcher_->Advance(kBatch, *this);
    if (!router_) return;
    (void)router_->Flush(SteadyClock::now());
    struct stat status = {};
    if (stat(queue_.c_str(), &status) != 0 || static_cast<uint64_t>(status.st_size) < kQueueBytes) return;
    written_bytes_ += static_cast<uint64_t>(status.st_size);
    (void)unlink(queue_.c_str());
  }

 private:
  void OnChange(Change change) override {
    ++changes_;
    if (router_) router_->Put(change, SteadyClock::now());
  }
  void OnCovered(const std::string&) override { covered_ = true; }
  void OnRefused(const std::string&, const std::string& reason) override { refusal_ = reason; }
  void OnLost() override { ++lost; }
  void OnRootDisturbed(const std::string&) override {}
  void OnCookie() override {}

  std::string queue_;
  std::unique_ptr<Watcher> watcher_;
  std::unique_ptr<QueueRouter> router_;
  bool covered_ = false;
  std::string refusal_;
  uint64_t changes_ = 0;
  uint64_t written_bytes_ = 0;
};

struct Result {
  double changes_a_second = 0;
  double cpu_ns = 0;  ///< a change
  uint64_t lost = 0;
};

Result Measure(const Settings& settings, Reader& reader) {
  int ends[2] = {};
  if (pipe2(ends, O_CLOEXEC) != 0) Die("pipe");
  const pid_t child = fork();
  if (child == 0) Produce(settings, ends[1]);
  const double cpu = ThreadSeconds();
  const auto begin = SteadyClock::now();
  uint64_t changes = 0;
  for (bool is_over = false; !is_over;) {
    pollfd polled[] = {{reader.Fd(), POLLIN, 0}, {ends[0], POLLIN, 0}};
    (void)poll(polled, 2, -1);
    is_over = polled[1].revents != 0;
    if (!is_over) (void)usleep(static_cast<useconds_t>(std::chrono::microseconds(kBatch).count()));
    reader.Take();
  }
  Result result;
  result.cpu_ns = ThreadSeconds() - cpu;
  const double seconds = std::chrono::duration<double>(SteadyClock::now() - begin).count();
  if (read(ends[0], &changes, sizeof(changes)) != sizeof(changes) || changes == 0) Die("the producer");
  (void)close(ends[0]);
  (void)close(ends[1]);
  (void)waitpid(child, nullptr, 0);
  result.cpu_ns *= 1e9 / static_cast<double>(changes);
  result.changes_a_second = static_cast<double>(changes) / seconds;
  result.lost = reader.lost;
  return result;
}

struct Row {
  const char* way;
  const char* what;
  std::function<std::unique_ptr<Reader>(const Settings&)> make;
  std::vector<Result> results = {};
};

std::unique_ptr<Watcher> MakeFilesystemWatcher(const std::string& cookie) {
  ferrox::notifyd::FilesystemWatcher::Options options;
  options.cookie = cookie;
  return std::make_unique<ferrox::notifyd::FilesystemWatcher>(options);
}

std::unique_ptr<Watcher> MakeFolderWatcher(std::unique_ptr<ferrox::notifyd::FolderPort> port,
                                           const std::string& cookie) {
  ferrox::notifyd::FolderWatcher::Options options;
  options.cookie_file = cookie;
  return std::make_unique<ferrox::notifyd::FolderWatcher>(std::move(port), options);
}

std::unique_ptr<Watcher> MakeInodeMarksWatcher(const std::string& cookie) {
  ferrox::notifyd::FanGroup group;
  if (const std::string problem = group.Open(); !problem.empty()) Die(problem);
  return MakeFolderWatcher(std::make_unique<ferrox::notifyd::FanInodePort>(std::move(group)), cookie);
}

std::unique_ptr<Watcher> MakeInotifyWatcher(const std::string& cookie) {
  auto port = std::make_unique<ferrox::notifyd::InotifyPort>();
  if (const std::string problem = port->Open(); !problem.empty()) Die(problem);
  return MakeFolderWatcher(std::move(port), cookie);
}

std::vector<Row> Rows() {
  std::vector<Row> rows;
  const auto add = [&rows](const char* way, std::function<std::unique_ptr<Reader>(const Settings&)> loop,
                           std::unique_ptr<Watcher> (*make)(const std::string& cookie)) {
    rows.push_back({way, "loop", std::move(loop)});
    for (const bool with_queue : {false, true}) {
      rows.push_back({way, with_queue ? "queue" : "watcher", [make, with_queue](const Settings& settings) {
                        const std::string cookie = settings.scratch + "/cookie";
                        return std::make_unique<WatcherReader>(settings, make(cookie), with_queue);
                      }});
    }
  };
  const auto fan_loop = [](bool inode_marks) {
    return [inode_marks](const Settings& settings) { return std::make_unique<FanLoop>(settings, inode_marks); };
  };
  if (geteuid() == 0) add("fanotify", fan_loop(false), &MakeFilesystemWatcher);
  add("fanotify inode marks", fan_loop(true), &MakeInodeMarksWatcher);
  add(
      "inotify", [](const Settings& settings) { return std::make_unique<InotifyLoop>(settings); }, &MakeInotifyWatcher);
  return rows;
}

double Median(const std::vector<Result>& results, double Result::*member) {
  std::vector<double> values;
  for (const Result& result : results) values.push_back(result.*member);
  std::sort(values.begin(), values.end());
  return values[values.size() / 2];
}

void Show(const std::vector<Row>& rows) {
  (void)printf("%-22s %-8s %12s %12s %10s %6s\n", "way", "reader", "changes/s", "CPU ns each", "times loop", "lost");
  double loop_ns = 0;
  for (const Row& row : rows) {
    const double ns = Median(row.results, &Result::cpu_ns);
    if (strcmp(row.what, "loop") == 0) loop_ns = ns;
    uint64_t lost = 0;
    for (const Result& result : row.results) lost += result.lost;
    (void)printf("%-22s %-8s %12.0f %12.0f %10.1f %6llu\n", row.way, row.what,
                 Median(row.results, &Result::changes_a_second), ns, ns / loop_ns,
                 static_cast<unsigned long long>(lost));
  }
}

bool ReadSettings(int argc, char** argv, Settings& settings) {
  for (int i = 1; i + 1 < argc; i += 2) {
    const std::string name = argv[i];
    const double value = atof(argv[i + 1]);
    if (name == "--scratch") {
      settings.scratch = argv[i + 1];
    } else if (name == "--only") {
      settings.only = argv[i + 1];
    } else if (name == "--folders") {
      settings.folders = static_cast<int>(value);
    } else if (name == "--rounds") {
      settings.rounds = static_cast<int>(value);
    } else if (name == "--seconds") {
      settings.seconds = value;
    } else if (name == "--rate") {
      settings.rate = value;
    } else {
      return false;
    }
  }
  return argc % 2 == 1;
}

}  // namespace

int main(int argc, char** argv) {
  Settings settings;
  if (!ReadSettings(argc, argv, settings)) {
    (void)fprintf(stderr,
                  "Usage: notify_bench [--folders N] [--rounds N] [--seconds "
                  "S] [--rate CHANGES_A_SECOND] [--scratch FOLDER] [--only WAY]\n");
    return 2;
  }
  settings.scratch += "/notify_bench.XXXXXX";
  if (mkdtemp(settings.scratch.data()) == nullptr) Die(settings.scratch);
  for (int i = 0; i < settings.folders; ++i) {
    std::filesystem::create_directories(settings.Folder(static_cast<uint64_t>(i)));
  }
  (void)close(open((settings.scratch + "/cookie").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  std::vector<Row> rows = Rows();
  (void)std::erase_if(rows, [&](const Row& row) { return !settings.only.empty() && settings.only != row.way; });
  for (int round = 0; round < settings.rounds; ++round) {
    for (Row& row : rows) row.results.push_back(Measure(settings, *row.make(settings)));
  }
  Show(rows);
  std::filesystem::remove_all(settings.scratch);
  return 0;
}
