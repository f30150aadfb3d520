#include "cli/explain.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>

#include <kova/fs.h>
#include <kova/lock_holder.h>

#include "common/file_util.h"
#include "fileindex/util.h"
#include "platform/host/share_table.h"
#include "sdk/share.h"
#include "services/support/settings_problem.h"

namespace ferrox::cli {

namespace {

struct Remedy {
  int code;
  const char* text;
};
constexpr Remedy kRemedies[] = {
    {Error::kShareEnumFailed, "'fileindexctl share list' says what is wrong with the table of shares"},
    {Error::kCredentialsFailed, "try again as root, or as the owner of the instance"},
    {Error::kLoadFailed, "correct the file, or move it away to start without it"},
    {Error::kSaveFailed, "see that its folder can be written and has space"},
    {Error::kLockFailed, "another program works on it; try again"},
    {Error::kNoSuchShare, "'fileindexctl share list' shows the shares"},
    {Error::kTooManyFolders, "one folder above several of them does instead; 'fileindexctl folder list' shows them"},
    {Error::kDuplicatedFolder, "'fileindexctl folder set' changes it"},
    {Error::kNoSuchFolder, "'fileindexctl folder list' shows the indexed folders"},
    {Error::kMalformedEvent, "'fileindexctl index' with the share's name compares everything anew"},
    {Error::kEngineUnreachable, "'fileindexctl up' starts the search engine"},
    {Error::kSpaceNotEnough, "make room on its volume, then try again"},
    {Error::kEngineStorage, "make room where the index lies, then try again"},
};

constexpr char kNotIndexable[] = "Path cannot index: ";

/// What the library's own words for a failed call mean.
struct Meaning {
  const char* begin;
  const char* text;
};
constexpr Meaning kMeanings[] = {
    {"Request failed, msg=", "the search engine: "},
    {"MonitorQueue::Upsert failed, share=", "the notification daemon's list cannot be given the folders of share "},
    {"MonitorQueue::Delete failed, share=", "the notification daemon's list cannot be rid of the folders of share "},
    {"KOVAShareNamePathGet failed, full_path=", "this lies in no share: "},
    {"FILEIDXQueuePathCompose failed, share_path=", "no queue can be had for the folder "},
    {"FILEIDXDBPathCompose failed, share_path=", "no index can be had for the folder "},
    {"KLIBShareEnum failed", "the shares cannot be listed"},
    {"Connect failed", "the search engine cannot be reached"},
    {"Send failed", "the search engine does not take the request"},
    {"Recv failed", "the search engine gives no answer that can be used"},
    {"Cannot load json: ", "cannot be read or is damaged: "},
};

/// Without the JSON text that some of the library's reasons end in.
std::string PlainReason(const Error& error) {
  const std::string reason = error.what();
  for (const Meaning& meaning : kMeanings) {
    const std::string begin = meaning.begin;
    if (StringStartWith(reason, begin)) return meaning.text + (begin.back() == 'd' ? "" : reason.substr(begin.size()));
  }
  return reason.substr(0, reason.find(", data="));
}

/// What is wrong with the settings that the failed step needed; empty when nothing is.
std::string SettingsProblem(const Error& error) {
  switch (error.Code()) {
    case Error::kNoSuchShare:
    case Error::kShareEnumFailed:
    case Error::kInternal:
      return kova::host::ShareTable::Load(kova::host::ShareTablePath()).Problem();
    case Error::kBadArgument:
    case Error::kLoadFailed:
      return services::FoldersFileProblem();
    default:
      return {};
  }
}

/// The library gives some of its reasons as a bare name or path.
std::string Sentence(const Error& error) {
  const std::string reason = PlainReason(error);
  const bool is_path = StringStartWith(reason, "/");
  switch (error.Code()) {
    case Error::kNoSuchShare:
      return "there is no share \"" + reason + "\"";
    case Error::kNoSuchFolder:
      return reason + " is no indexed folder";
    case Error::kTooManyFolders:
      return "there would be too many indexed folders: at most 1000";
    case Error::kSaveFailed:
      return is_path ? "cannot write " + reason : reason;
    case Error::kInternal:
      return is_path ? "cannot change the mode of " + reason : reason;
    default:
      return reason.empty() ? "that did not work" : reason;
  }
}

bool IsDaemonChannel(const std::string& reason) {
  return StringStartWith(reason, "write failed") || StringStartWith(reason, "read failed");
}

/// Of a lock that was waited for in vain.
std::string HolderOf(const std::string& reason) {
  const size_t path = reason.rfind("path=");
  const std::string holder = path == std::string::npos ? "" : kova::LockHolderText(reason.substr(path + 5));
  return holder.empty() ? "" : holder + "; end it if it hangs, and try again";
}

std::string RemedyFor(const Error& error) {
  const std::string reason = error.what();
  if (error.Code() == Error::kLockFailed && !HolderOf(reason).empty()) return HolderOf(reason);
  if (error.Code() == Error::kPathNotIndexable && StringStartWith(reason, kNotIndexable)) {
    return WhyNotIndexable(reason.substr(sizeof(kNotIndexable) - 1));
  }
  if (error.Code() == Error::kInternal) {
    return IsDaemonChannel(reason) ? "the index daemon does not answer; 'fileindexctl up' starts it"
                                   : "the system log says more";
  }
  for (const Remedy& remedy : kRemedies) {
    if (remedy.code == error.Code()) return remedy.text;
  }
  return {};
}

std::string WhyNotIndexableAt(const std::string& full_path, const sdk::SDKShare& share) {
  struct stat status = {};
  if (lstat(full_path.c_str(), &status) != 0) {
    return errno == ENOENT ? "there is no such folder; make it first" : full_path + ": " + strerror(errno);
  }
  const std::string real = RealPath(full_path);
  if (real != full_path) {
    return (S_ISLNK(status.st_mode) ? "it is a link to " : "it is, without links and \"..\", ") + real +
           "; add that folder";
  }
  if (!share.CanBeIndexed()) return "its share is locked or read-only";
  if (fileindex::IsFullPathInRecycleBin(full_path)) return "it lies in a recycle bin, which is never indexed";
  const int type = KOVAGetFSType(full_path.c_str(), 0);
  if (type < 0 || KOVAFSIsRemoteFS(type) == 1) return "its files are on another machine; index them there";
  if (KOVAFSDirIsMntPoint(full_path.c_str()) == 1) {
    return "something else is mounted there; make it a share of its own ('fileindexctl share add')";
  }
  return "nothing is indexed in snapshots, mounted images and the system's own file systems";
}

}  // namespace

std::string WhyNotIndexable(const std::string& share_path) {
  try {
    const sdk::SDKShare share(fileindex::GetShareNameByPath(share_path));
    return WhyNotIndexableAt(fileindex::GetFullPath(share_path), share);
  } catch (const Error&) {
    return {};
  }
}

std::string Explain(const Error& error, const std::string& note) {
  const std::string problem = SettingsProblem(error);
  if (!problem.empty())
    return problem + (note.empty() ? "" : "; " + note) + " (error " + std::to_string(error.Code()) + ")";
  std::string text = Sentence(error);
  for (const std::string& part : {RemedyFor(error), note}) {
    if (!part.empty()) text += "; " + part;
  }
  return text + " (error " + std::to_string(error.Code()) + ")";
}

}  // namespace ferrox::cli
