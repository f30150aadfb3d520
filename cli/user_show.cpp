#include <cstdio>
#include <optional>
#include <string>
#include <utility>

#include "cli/as_user.h"
#include "cli/ask.h"
#include "cli/document.h"
#include "cli/escape.h"
#include "cli/explain_access.h"
#include "cli/folder_path.h"
#include "cli/format.h"
#include "cli/hidden_name.h"
#include "cli/output.h"
#include "cli/user_commands.h"
#include "common/error.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/util.h"
#include "wire/engine_requests.h"
#include "wire/fields.h"

namespace ferrox::cli {

namespace {

/// The reply of "show". Which share a path is of, the engine finds out.
Json::Value AskForDocument(const std::string& path, const std::optional<AskedUser>& user) {
  Json::Value data;
  data["path"] = path;
  data["text"] = true;
  if (user.has_value()) data["as"] = ToJson(*user);
  return AskEngine(wire::EngineRequest("show", data))["document"];
}

/// `hiding`: the rule by which the user of "--as" is not shown it everywhere, or "".
void PrintForUser(Json::Value document, const std::string& hiding, const Arguments& arguments) {
  const std::string text = TextOf(document, fileindex::elastic::kKOVAMDTextContent);
  if (arguments.Has("--text")) {
    PrintWholeText(text);
  } else if (arguments.Has("--json")) {
    if (!hiding.empty()) document["hidden_by"] = hiding;
    PrintJson(document);
  } else {
    document.removeMember(fileindex::elastic::kKOVAMDTextContent);
    PrintDocument(document, text, Fields::kPublic);
    PrintHiding(hiding);
  }
}

/// Of another user than the caller it is told why nothing is shown; what a user may not read, that user is not told.
void TellNotShown(const std::string& path, const std::string& sentence, const std::optional<AskedUser>& user,
                  bool json) {
  if (user.has_value()) {
    PrintWhyNotShown(path, fileindex::GetShareNameByPath(ToSharePath(path, fileindex::FolderMgr())), *user, json);
  } else {
    (void)fprintf(stderr, "%s\n", EscapeForTerminal(sentence).c_str());
  }
}

/// @return whether the user is shown the file.
bool ShowForUser(const std::string& path, const Arguments& arguments, const std::optional<AskedUser>& user) try {
  Json::Value document = AskForDocument(path, user);
  PrintForUser(std::move(document), user.has_value() ? RuleThatHidesName(path) : "", arguments);
  return true;
} catch (const Refusal& refusal) {
  if (refusal.Code() == Error::kEngineBadRequest) throw UsageError(EscapeForTerminal(refusal.Reason()));
  if (refusal.Code() != Error::kEngineNoSuchDocument) throw Failure(refusal.Reason());
  TellNotShown(path, refusal.Reason(), user, arguments.Has("--json"));
  return false;
}

/// The full path of what root means by a word.
std::string FullPathOf(const std::string& file) {
  return fileindex::GetFullPath(ToSharePath(file, fileindex::FolderMgr()));
}

}  // namespace

/// All files are shown, also behind one that is not in the index.
int RunUserShow(const Arguments& arguments) {
  std::optional<AskedUser> user;
  if (arguments.Has("--as")) user = UserOf(arguments);
  bool all = true;
  for (const std::string& file : arguments.words) {
    all = ShowForUser(user.has_value() ? FullPathOf(file) : AbsolutePath(file), arguments, user) && all;
  }
  return all ? kDone : kNothingFound;
}

}  // namespace ferrox::cli
