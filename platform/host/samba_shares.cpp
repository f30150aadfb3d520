#include "platform/host/samba_shares.h"

#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <chrono>
#include <sstream>

#include "base/mutex.h"
#include "base/path.h"
#include "platform/host/configuration.h"
#include "platform/host/files.h"
#include "platform/host/log.h"
#include "platform/host/run_program.h"
#include "platform/host/samba_files.h"
#include "platform/host/share_rules.h"
#include "platform/host/share_users.h"
#include "platform/host/stat_cache.h"

namespace kova::host {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr std::chrono::seconds kLookEvery{1};
constexpr std::chrono::seconds kRetryAfter{60};
constexpr char kUsualRepository[] = ".recycle";

/// "recycle" among the modules, which may carry an instance's name after a colon.
bool HasRecycle(const std::string& modules) {
  std::istringstream words(modules);
  for (std::string word; words >> word;) {
    if (word.substr(0, word.find(':')) == "recycle") return true;
  }
  return false;
}

std::string PlainPath(std::string path) {
  if (path.size() > 1 && path.front() == '"' && path.back() == '"') path = path.substr(1, path.size() - 2);
  while (path.size() > 1 && path.back() == '/') path.pop_back();
  return path;
}

/// The first component below the share of where deleted files go.
std::string RecycleFolder(const std::string& repository) {
  const size_t begin = repository.find_first_not_of('/');
  if (begin == std::string::npos) return kUsualRepository;
  return repository.substr(begin, repository.find('/', begin) - begin);
}

std::string FolderProblem(const ShareEntry& share) {
  struct stat info = {};
  // A volume that is not there now may come back.
  return stat(share.path.c_str(), &info) == 0 ? ShareFolderProblem(share) : std::string();
}

/// One section as a share; false when it is none here, with the reason unless there is nothing to say.
bool TakeSection(const SmbConf& conf, const std::string& section, ShareEntry& share, std::string& problem) {
  const auto value = [&](const char* parameter) { return conf.Get(section, parameter).value_or(""); };
  if (conf.IsOn(section, "printable") || SmbConf::Boolean(value("available")) == false) return false;
  share.path = PlainPath(value("path"));
  // Upper and lower case do not count in Samba's names; here a share is called as its folder.
  const std::string folder = base::NameOf(share.path);
  share.name = SmbConf::Fold(folder) == SmbConf::Fold(section) ? folder : section;
  if (share.path.find('%') != std::string::npos) {
    problem = "its path " + share.path + " differs from user to user";
    return false;
  }
  problem = ShareTextProblem(share.name, share.path);
  if (problem.empty()) problem = FolderProblem(share);
  if (!problem.empty()) return false;
  share.hide_unreadable = conf.IsOn(section, "hide unreadable");
  // Samba lets nobody write unless "read only" is off. Whether the host itself can write depends on the volume.
  share.ftp_privilege = SmbConf::Boolean(value("read only")) == false ? 2 : 1;
  share.users = SambaUsers(conf, section);
  share.names = SambaNames(conf, section);
  share.foreign_rights = SambaRightsProblem(conf, section);
  if (!HasRecycle(value("vfs objects"))) return true;
  share.recycle = RecycleFolder(value("recycle:repository"));
  if (share.recycle.find('%') != std::string::npos) {
    problem = "its recycle bin " + share.recycle + " differs from user to user and is taken for a common folder";
    share.recycle.clear();
  }
  return true;
}

struct SeenFile {
  std::string path;
  struct stat info = {};
};

SeenFile Look(const std::string& path) {
  SeenFile file = {path, {}};
  if (stat(path.c_str(), &file.info) != 0) file.info = {};
  return file;
}

/// The last answer and what it was made from. One mutex around all, so that callers that ask at once share one run of
/// testparm.
class Source {
 public:
  std::shared_ptr<const std::vector<ShareEntry>> Get() {
    const base::MutexLock lock(mutex_);
    const auto now = SteadyClock::now();
    if (now < look_at_) return answer_;
    look_at_ = now + kLookEvery;
    const auto configuration = GetConfiguration();
    if (!configuration->problem.empty()) return answer_;
    const bool asked_anew = configuration != configuration_;
    configuration_ = configuration;
    if (!configuration->samba.shares) {
      answer_.reset();
    } else if (asked_anew || (failed_ && now >= retry_at_) || HasChanged()) {
      Ask(configuration->samba);
    }
    return answer_;
  }

  void LookSoon() {
    const base::MutexLock lock(mutex_);
    look_at_ = {};
  }

 private:
  bool HasChanged() const BASE_REQUIRES(mutex_) {
    return std::any_of(files_.begin(), files_.end(),
                       [](const SeenFile& file) { return !SameFile(Look(file.path).info, file.info); });
  }

  /// Takes the files' stamps before testparm runs: what changes meanwhile is noticed by the next call.
  void Ask(const Configuration::Samba& samba) BASE_REQUIRES(mutex_) {
    files_ = {Look(samba.config)};
    std::string text, output;
    (void)ReadTextFile(samba.config, text);
    for (const IncludedFile& file : ReadIncludedFiles(SmbConf(text))) files_.push_back(Look(file.path));
    failed_ = RunForOutput(samba.testparm, {"-s", "--suppress-prompt", samba.config}, output) != 0;
    if (failed_) {
      retry_at_ = SteadyClock::now() + kRetryAfter;
      LogChange(LOG_ERR, samba.testparm,
                "Samba's shares cannot be read" + std::string(answer_ != nullptr ? " anew" : "") + ": '" +
                    samba.testparm + " -s " + samba.config + "' fails and says why");
      return;
    }
    std::vector<std::string> problems;
    answer_ = std::make_shared<const std::vector<ShareEntry>>(ParseTestparm(output, problems));
    for (const std::string& problem : problems) LogChange(LOG_WARNING, samba.config + " " + problem, problem);
    LogChange(LOG_INFO, samba.testparm, "Samba has " + std::to_string(answer_->size()) + " shares to be indexed");
  }

  base::Mutex mutex_;
  std::shared_ptr<const Configuration> configuration_ BASE_GUARDED_BY(mutex_);
  std::shared_ptr<const std::vector<ShareEntry>> answer_ BASE_GUARDED_BY(mutex_);
  std::vector<SeenFile> files_ BASE_GUARDED_BY(mutex_);
  SteadyClock::time_point look_at_ BASE_GUARDED_BY(mutex_);
  SteadyClock::time_point retry_at_ BASE_GUARDED_BY(mutex_);
  bool failed_ BASE_GUARDED_BY(mutex_) = false;
};

Source& TheSource() {
  static auto* source = new Source;  // never freed, like the share table
  return *source;
}

}  // namespace

std::vector<ShareEntry> ParseTestparm(const std::string& output, std::vector<std::string>& problems) {
  const SmbConf conf(output);
  std::vector<ShareEntry> shares;
  for (const std::string& section : conf.Sections()) {
    if (IsSpecialSection(section)) continue;
    ShareEntry share;
    std::string problem;
    const bool taken = TakeSection(conf, section, share, problem);
    if (taken) shares.push_back(share);
    if (problem.empty()) continue;
    problems.push_back(std::string("Samba's share \"") + section + "\"" + (taken ? ": " : " is left out: ") + problem);
  }
  return shares;
}

std::shared_ptr<const std::vector<ShareEntry>> SambaShares() { return TheSource().Get(); }

void ExpectSambaChange() { TheSource().LookSoon(); }

}  // namespace kova::host
