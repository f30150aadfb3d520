#include <cstdio>

#include "cli/ask.h"
#include "cli/document.h"
#include "cli/escape.h"
#include "cli/folder_path.h"
#include "cli/format.h"
#include "cli/left_out.h"
#include "cli/output.h"
#include "cli/user_commands.h"
#include "common/error.h"
#include "wire/engine_requests.h"
#include "wire/fields.h"

namespace ferrox::cli {

namespace {

/// Which of several files a share is of, the engine finds out. @return whether the user may know of it.
bool ShowForUser(const std::string& file, const Arguments& arguments, LeftOut& left_out) try {
  Json::Value data;
  data["path"] = AbsolutePath(file);
  data["text"] = true;
  const Json::Value document = AskEngine(wire::EngineRequest("show", data))["document"];
  const std::string text = TextOf(document, fileindex::elastic::kKOVAMDTextContent);
  if (arguments.Has("--text")) {
    PrintWholeText(text);
  } else if (arguments.Has("--json")) {
    PrintJson(document);
  } else {
    Json::Value fields = document;
    fields.removeMember(fileindex::elastic::kKOVAMDTextContent);
    PrintDocument(fields, text, Fields::kPublic);
  }
  return true;
} catch (const Refusal& refusal) {
  if (refusal.Code() == Error::kEngineBadRequest) throw UsageError(EscapeForTerminal(refusal.Reason()));
  if (refusal.Code() == Error::kEngineNoSuchDocument) {
    (void)fprintf(stderr, "%s\n", EscapeForTerminal(refusal.Reason()).c_str());
  } else if (refusal.Code() == Error::kEngineRightsUnknown || refusal.Code() == Error::kEngineUserBusy) {
    throw Failure(refusal.Reason());
  } else {
    left_out.AddForUser("", refusal.Code(), refusal.Reason());
  }
  return false;
}

}  // namespace

/// All files are shown, also behind one that is not in the index.
int RunUserShow(const Arguments& arguments) {
  bool all = true;
  LeftOut left_out;
  for (const std::string& file : arguments.words) all = ShowForUser(file, arguments, left_out) && all;
  left_out.Warn();
  if (!left_out.Empty()) return kIncomplete;
  return all ? kDone : kNothingFound;
}

}  // namespace ferrox::cli
