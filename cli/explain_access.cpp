#include "cli/explain_access.h"

#include <fcntl.h>
#include <grp.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include <kova/content_extract.h>

#include "base/file_stamp.h"
#include "base/path.h"
#include "cli/ask.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "cli/hidden_name.h"
#include "cli/output.h"
#include "cli/why_not_indexed.h"
#include "fileindex/elastic/elastic_control.h"
#include "sdk/share.h"
#include "wire/engine_requests.h"
#include "wire/fields.h"

namespace ferrox::cli {

namespace {

using fileindex::elastic::GetFileIndexID;

/// "/", "/a", "/a/b" of "/a/b".
std::vector<std::string> PlacesOnWay(const std::string& path) {
  std::vector<std::string> places = {"/"};
  for (size_t end = path.find('/', 1); end != std::string::npos; end = path.find('/', end + 1)) {
    places.push_back(path.substr(0, end));
  }
  if (path != "/") places.push_back(path);
  return places;
}

AccessStep StepAt(const std::string& place, bool is_last, bool is_in_share, const AskedUser& user) {
  AccessStep step;
  step.path = place;
  step.wanted = is_last ? Wanted::kRead : Wanted::kEnter;
  struct stat status = {};
  if ((is_in_share ? lstat(place.c_str(), &status) : stat(place.c_str(), &status)) != 0) {
    step.decision.rule = strerror(errno);
  } else if (S_ISLNK(status.st_mode)) {
    step.decision.rule = "it is a link, which is not followed";
  } else {
    step.access = KOVA::CONTENT_EXTRACT::Access(place, status);
    step.decision = DecideAccess(step.access, user, step.wanted);
  }
  return step;
}

/// Only what has no effect when it is opened.
bool CanBeTried(const std::string& path) {
  struct stat status = {};
  return lstat(path.c_str(), &status) == 0 && (S_ISREG(status.st_mode) || S_ISDIR(status.st_mode));
}

/// In a process of its own, since the tool cannot take its ids back. Nothing when that cannot be made.
std::optional<bool> KernelOpens(const std::string& path, const AskedUser& user) {
  constexpr int kOpened = 0;
  constexpr int kRefused = 1;
  constexpr int kUnknown = 2;
  if (geteuid() != 0 || user.groups.empty() || !CanBeTried(path)) return {};
  const pid_t child = fork();
  if (child < 0) return {};
  if (child == 0) {
    const gid_t group = user.groups[0];
    const bool is_user = setgroups(user.groups.size(), user.groups.data()) == 0 &&
                         setresgid(group, group, group) == 0 && setresuid(user.uid, user.uid, user.uid) == 0;
    const bool opens = is_user && open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY) >= 0;
    _exit(!is_user ? kUnknown : opens ? kOpened : kRefused);
  }
  int status = 0;
  while (waitpid(child, &status, 0) < 0) {
    if (errno != EINTR) return {};
  }
  if (!WIFEXITED(status) || WEXITSTATUS(status) == kUnknown) return {};
  return WEXITSTATUS(status) == kOpened;
}

const char* VerbOf(Wanted wanted) { return wanted == Wanted::kEnter ? "enter" : "read"; }

/// The engine's own word on the share as a whole: the user may not enter it, a rule closes it, it is being prepared.
/// "" when it is searched for the user.
std::string WhyShareIsClosed(const std::string& share, const AskedUser& user) try {
  Json::Value data;
  data["query"] = "size:>=0";
  data["limit"] = 1;
  data["shares"].append(share);
  data["as"] = ToJson(user);
  (void)Search(data);
  return "";
} catch (const Refusal& refusal) {
  return refusal.Reason();
} catch (const NotPermitted& refusal) {
  return refusal.what();
}

/// The document at a path as root sees it; null where there is none.
Json::Value DocumentAt(const std::string& path, const std::string& share) {
  const Json::Value documents = AskEngine(wire::FindDocumentsRequest(GetFileIndexID(share), {wire::OnlyAt(path)}));
  return documents.empty() ? Json::Value() : documents[0];
}

/// Where the index knows other rights than the disk has, on the way below the share's folder; "" where it does not.
std::string OtherRightsInIndex(const AccessWay& way, const std::string& root, const std::string& share,
                               const AskedUser& user) {
  for (const AccessStep& step : way.steps) {
    if (!base::IsAtOrBelow(step.path, root)) continue;
    const Json::Value document = DocumentAt(step.path, share);
    if (document.isNull()) continue;
    const std::string known = TextOf(document, fileindex::elastic::k_KOVAAccess);
    if (known.empty()) return "the index does not know the rights of " + step.path + " yet";
    if (DecideAccess(known, user, step.wanted).granted) continue;
    return "the index does not know the present rights of " + step.path + " yet, only " + known;
  }
  return "";
}

/// Why the index does not give what the disk would.
std::string WhyNotByIndex(const AccessWay& way, const std::string& root, const std::string& share,
                          const AskedUser& user) {
  const std::string closed = WhyShareIsClosed(share, user);
  if (!closed.empty()) return closed;
  const std::string& path = way.steps.back().path;
  const Json::Value document = DocumentAt(path, share);
  if (document.isNull()) return "it is not in the index: " + WhyNotIndexed(path, share);
  const std::string rights = OtherRightsInIndex(way, root, share, user);
  if (!rights.empty()) return rights + "; 'fileindexctl index " + share + "' compares them";
  struct stat status = {};
  const std::optional<base::FileStamp> stamp =
      base::FileStamp::Parse(TextOf(document, fileindex::elastic::k_KOVAStamp));
  if (lstat(path.c_str(), &status) == 0 && stamp.has_value()) {
    const base::FileStamp now = base::FileStamp::Of(status);
    const bool is_same = S_ISDIR(status.st_mode) ? stamp->SameFile(now) : *stamp == now;
    if (!is_same) return "it has changed since it was indexed, and is shown again once the index has it";
  }
  return "nothing here tells why; it may have changed just now";
}

std::string WhyNotShown(const AccessWay& way, const std::string& root, const std::string& share,
                        const AskedUser& user) {
  const AccessStep& last = way.steps.back();
  if (!last.decision.granted) {
    return "may not " + std::string(VerbOf(last.wanted)) + " " + last.path + ": " + last.decision.rule;
  }
  if (way.kernel_opens == std::optional(false)) return "the system refuses it by another rule than modes and ACLs";
  return WhyNotByIndex(way, root, share, user);
}

Json::Value WayAsJson(const AccessWay& way) {
  Json::Value json(Json::arrayValue);
  for (const AccessStep& step : way.steps) {
    Json::Value& entry = json.append(Json::Value());
    entry["path"] = step.path;
    entry["wanted"] = VerbOf(step.wanted);
    entry["access"] = step.access;
    entry["granted"] = step.decision.granted;
    entry["rule"] = step.decision.rule;
  }
  return json;
}

void PrintStep(const AccessStep& step) {
  (void)printf("    %s: %s %s%s%s, %s\n", EscapeForTerminal(step.path).c_str(), VerbOf(step.wanted),
               step.decision.granted ? "yes" : "no", step.access.empty() ? "" : ", ", step.access.c_str(),
               EscapeForTerminal(step.decision.rule).c_str());
}

}  // namespace

AccessWay FollowAccess(const std::string& path, const std::string& root, const AskedUser& user) {
  AccessWay way;
  for (const std::string& place : PlacesOnWay(path)) {
    way.steps.push_back(StepAt(place, place == path, base::IsAtOrBelow(place, root), user));
    if (!way.steps.back().decision.granted) break;
  }
  way.kernel_opens = KernelOpens(path, user);
  return way;
}

void PrintWhyNotShown(const std::string& path, const std::string& share, const AskedUser& user, bool json) {
  const std::string root = sdk::SDKShare(share).GetPath();
  const AccessWay way = FollowAccess(path, root, user);
  const std::string reason = WhyNotShown(way, root, share, user);
  const std::string hiding = RuleThatHidesName(path);
  // Rights are one part of what a system decides by; what this page says of them is held against the whole.
  const bool disagrees = way.kernel_opens.has_value() && *way.kernel_opens != way.Granted();
  if (json) {
    Json::Value told;
    told["path"] = path;
    told["as"] = ToJson(user);
    told["reason"] = reason;
    told["way"] = WayAsJson(way);
    if (way.kernel_opens.has_value()) told["opens"] = *way.kernel_opens;
    if (!hiding.empty()) told["hidden_by"] = hiding;
    PrintJson(told);
    return;
  }
  (void)printf("%s is not shown to user %s: %s\n", EscapeForTerminal(path).c_str(),
               EscapeForTerminal(user.name).c_str(), EscapeForTerminal(reason).c_str());
  for (const AccessStep& step : way.steps) PrintStep(step);
  if (disagrees) {
    (void)printf("    a process of this user %s it all the same\n", *way.kernel_opens ? "can open" : "cannot open");
  }
  PrintHiding(hiding);
}

}  // namespace ferrox::cli
