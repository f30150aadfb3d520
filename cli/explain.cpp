#include "cli/explain.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <vector>

#include <kova/fs.h>
#include <kova/lock_holder.h>

#include "cli/did_you_mean.h"
#include "common/file_util.h"
#include "common/subject_error.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/util.h"
#include "platform/host/share_table.h"
#include "sdk/share.h"
#include "services/support/settings_problem.h"

/// Two tables, what went wrong by the subject of the failure and what helps by its code, and a few remedies that depend
/// on the thing itself.
namespace ferrox::cli {

namespace {

/// What helps against every failure of a code.
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
    {Error::kDuplicatedFolder, "'fileindexctl folder set' changes its kinds"},
    {Error::kNoSuchFolder, "'fileindexctl folder list' shows the indexed folders"},
    {Error::kMalformedEvent, "'fileindexctl index' with the share's name compares everything anew"},
    {Error::kEngineUnreachable, "'fileindexctl up' starts the search engine"},
    {Error::kSpaceNotEnough, "make room on its volume, then try again"},
    {Error::kEngineStorage, "make room where the index lies, then try again"},
};

/// What the library failed to do, in words for people; the subject's name follows.
struct Wording {
  Subject::Kind about;
  const char* text;
};
constexpr Wording kWordings[] = {
    {Subject::kShares, "the shares cannot be listed"},
    {Subject::kShareOfPath, "this lies in no share: "},
    {Subject::kQueuePlace, "no queue can be had for the folder "},
    {Subject::kIndexPlace, "no index can be had for the folder "},
    {Subject::kWatching, "the notification daemon's list cannot be given the folders of share "},
    {Subject::kWatchingEnd, "the notification daemon's list cannot be rid of the folders of share "},
    {Subject::kEngineConnect, "the search engine cannot be reached"},
    {Subject::kEngineSend, "the search engine does not take the request"},
    {Subject::kEngineReply, "the search engine gives no answer that can be used"},
    {Subject::kEngineRefusal, "the search engine: "},
    {Subject::kJson, ""},  // the library's own words, without the text that they are about
};

/// What was wrong with a file of the configuration: the code says which of three things was done with it.
std::string FileWording(const Error& error) {
  if (error.Code() == Error::kLoadFailed) return "cannot be read or is damaged: ";
  return error.Code() == Error::kSaveFailed ? "cannot write " : "cannot change the mode of ";
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

/// Names to choose from; none where they cannot be read, which other messages say.
std::vector<std::string> SharesThere() try { return sdk::SDKShare::Enum(); } catch (const Error&) {
  return {};
}

std::vector<std::string> FoldersThere() try {
  const fileindex::FolderMgr configured;
  std::vector<std::string> paths;
  for (const auto& folder : configured.GetFolders()) paths.push_back(folder->GetPath());
  return paths;
} catch (const Error&) {
  return {};
}

/// What went wrong. The library gives some of its reasons as a bare name.
std::string Sentence(const Error& error) {
  const Subject subject = SubjectError::Of(error);
  if (subject.kind == Subject::kFile) return FileWording(error) + subject.name;
  for (const Wording& wording : kWordings) {
    if (wording.about == subject.kind) return wording.text + subject.name;
  }
  const std::string reason = error.what();
  switch (error.Code()) {
    case Error::kNoSuchShare:
      return "there is no share \"" + reason + "\"" + DidYouMean(reason, SharesThere());
    case Error::kNoSuchFolder:
      return reason + " is no indexed folder" + DidYouMean(reason, FoldersThere());
    case Error::kTooManyFolders:
      return "there would be too many indexed folders: at most 1000";
    default:
      return reason.empty() ? "the operation failed" : reason;
  }
}

/// Of a lock that was waited for in vain; empty when nobody holds it any more.
std::string HolderOf(const std::string& lock_path) {
  const std::string holder = kova::LockHolderText(lock_path);
  return holder.empty() ? "" : holder + "; end it if it hangs, and try again";
}

/// What to do about it, "" where the sentence says it all. A remedy that knows the thing comes before the one of the
/// code.
std::string RemedyFor(const Error& error) {
  const Subject subject = SubjectError::Of(error);
  const std::string holder = subject.kind == Subject::kLock ? HolderOf(subject.name) : "";
  if (!holder.empty()) return holder;
  if (error.Code() == Error::kPathNotIndexable && subject.kind == Subject::kFolder) {
    return WhyNotIndexable(subject.name);
  }
  if (error.Code() == Error::kInternal) {
    return subject.kind == Subject::kDaemonChannel ? "the index daemon does not answer; 'fileindexctl up' starts it"
                                                   : "the system log says more";
  }
  for (const Remedy& remedy : kRemedies) {
    if (remedy.code == error.Code()) return remedy.text;
  }
  return {};
}

/// The library says only that a path cannot be indexed; here its rules are asked one by one, in its own order.
std::string WhyNotIndexableAt(const std::string& full_path, const sdk::SDKShare& share) {
  struct stat status = {};
  if (lstat(full_path.c_str(), &status) != 0) {
    return errno == ENOENT ? "there is no such folder; make it first" : full_path + ": " + strerror(errno);
  }
  // Paths are indexed in one form only, so that a file has one document.
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
    if (!part.empty()) text += (text.back() == '?' ? " " : "; ") + part;
  }
  return text + " (error " + std::to_string(error.Code()) + ")";
}

}  // namespace ferrox::cli
