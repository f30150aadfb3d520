#include <cstdio>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/configuration_change.h"
#include "cli/document.h"
#include "cli/escape.h"
#include "cli/folder_path.h"
#include "cli/format.h"
#include "cli/left_out.h"
#include "cli/output.h"
#include "cli/share_place.h"
#include "cli/user_commands.h"
#include "cli/why_not_indexed.h"
#include "common/file_util.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "wire/engine_requests.h"
#include "wire/fields.h"

/// What the index holds of single files, and which files it holds without their content. Fields of documents are named
/// in wire/fields.h; those that begin with "_KOVA" are the service's own.
namespace ferrox::cli {

namespace {

using namespace fileindex::elastic;  // the fields' names

/// Documents that one request asks for.
constexpr unsigned kPageEntries = 10000;

/// Documents of the share's index that a query asks for.
Json::Value Entries(const std::string& share, const wire::DocumentQuery& query) {
  return AskEngine(wire::FindDocumentsRequest(GetFileIndexID(share), query));
}

/// @return whether the file is in the index.
bool Show(const std::string& file, const Arguments& arguments, LeftOut& left_out) {
  const std::string share_path = ToSharePath(file, fileindex::FolderMgr());
  const std::string path = fileindex::GetFullPath(share_path);
  const std::string holder = IndexedShareOf(path).share;
  const std::string share = holder.empty() ? fileindex::GetShareNameByPath(share_path) : holder;
  Json::Value documents;
  if (!left_out.Unless(share, [&] { documents = Entries(share, {wire::OnlyAt(path)}); })) return false;
  if (documents.empty()) {
    if (left_out.AddIfRebuilding(share)) return false;
    (void)fprintf(stderr, "%s is not in the index: %s\n", EscapeForTerminal(path).c_str(),
                  EscapeForTerminal(WhyNotIndexed(path, share)).c_str());
    return false;
  }
  const Json::Value texts = Entries(share, {wire::OnlyAt(path), {kKOVAMDTextContent}});
  const std::string text = texts.empty() ? "" : TextOf(texts[0], kKOVAMDTextContent);
  if (arguments.Has("--text")) {
    PrintWholeText(text);
  } else if (arguments.Has("--json")) {
    if (!text.empty()) documents[0][kKOVAMDTextContent] = text;
    PrintJson(documents[0]);
  } else {
    const bool is_unwanted = !documents[0][k_KOVANeedMeta].isBool() && !BoolOf(documents[0], kKOVAMDIsDir);
    PrintDocument(documents[0], text, Fields::kAll, is_unwanted ? WhyNameOnly(path) : "");
  }
  return true;
}

/// One file with the reason that the reader gave.
void PrintUnread(const Json::Value& document, bool json) {
  if (!json) {
    (void)printf("%s\n    %s\n", EscapeForTerminal(TextOf(document, kKOVAMDPath)).c_str(),
                 EscapeOneLine(TextOf(document, k_KOVAExtractError)).c_str());
    return;
  }
  Json::Value line;
  line["path"] = document[kKOVAMDPath];
  line["reason"] = document[k_KOVAExtractError];
  line["partly_read"] = StringStartWith(TextOf(document, k_KOVAExtractError), kPartlyRead);
  line["reader_version"] = Json::Int64(IntOf(document, k_KOVAExtractVersion));
  PrintJson(line);
}

/// Page by page, each going on behind the path at which the last one ended, so that memory does not grow with the
/// share. @return how many there are.
uint64_t ListUnread(const std::string& share, bool json) {
  uint64_t count = 0;
  wire::DocumentQuery query = {wire::Unread(), {kKOVAMDPath, k_KOVAExtractError, k_KOVAExtractVersion}, kPageEntries};
  while (true) {
    const Json::Value page = Entries(share, query);
    for (const Json::Value& document : page) PrintUnread(document, json);
    count += page.size();
    if (page.size() < kPageEntries) return count;
    query.after = page[page.size() - 1][kKOVAMDPath].asString();
  }
}

/// Null when it does not run; one that does not answer hides nothing of what the engine tells.
Json::Value StatusOfIndexDaemon() try {
  return AskIndexDaemonIfRunning("status", Json::Value());
} catch (const Failure& failure) {
  (void)fprintf(stderr, "which folders are left out is not known: %s\n", EscapeForTerminal(failure.what()).c_str());
  return Json::Value();
}

/// Ignore files of the share that are not followed.
void ListRefusedPatterns(const Json::Value& daemon, const std::string& share, bool json) {
  const Json::Value entry = ShareIn(daemon, share);
  for (const Json::Value& file : entry["refused_patterns"]) {
    if (json) {
      PrintJson(file);
    } else {
      (void)printf("%s\n    its patterns are not followed: %s\n", EscapeForTerminal(TextOf(file, "path")).c_str(),
                   EscapeForTerminal(TextOf(file, "reason")).c_str());
    }
  }
}

/// Folders of the share that are no part of its index, unless another share has them. Nothing when no daemon tells.
uint64_t ListLeftOut(const Json::Value& daemon, const std::string& share, bool json) {
  uint64_t count = 0;
  const Json::Value entry = ShareIn(daemon, share);
  for (const Json::Value& folder : entry["left_out"]) {
    if (folder.isMember("share")) continue;
    ++count;
    if (json) {
      PrintJson(folder);
    } else {
      (void)printf("%s\n    left out with all in it: %s\n", EscapeForTerminal(TextOf(folder, "path")).c_str(),
                   EscapeForTerminal(TextOf(folder, "reason")).c_str());
    }
  }
  return count;
}

}  // namespace

/// All files are shown, also behind one that is not in the index.
int RunShow(const Arguments& arguments) {
  if (arguments.Has("--as")) return RunUserShow(arguments);
  bool all = true;
  LeftOut left_out;
  for (const std::string& file : arguments.words) all = Show(file, arguments, left_out) && all;
  left_out.Warn();
  if (!left_out.Empty()) return kIncomplete;
  return all ? kDone : kNothingFound;
}

/// All shares with folders, unless some are named. Folders that the daemon leaves out as a whole (another file system,
/// another share) are listed with the files.
int RunUnread(const Arguments& arguments) {
  uint64_t count = 0;
  uint64_t folders = 0;
  LeftOut left_out;
  const Json::Value daemon = StatusOfIndexDaemon();
  for (const std::string& share : IndexedShares(arguments.words)) {
    (void)left_out.Unless(share, [&] {
      count += ListUnread(share, arguments.Has("--json"));
      (void)left_out.AddIfRebuilding(share);
    });
    folders += ListLeftOut(daemon, share, arguments.Has("--json"));
    ListRefusedPatterns(daemon, share, arguments.Has("--json"));
  }
  FlushOutput();
  (void)fprintf(stderr, "%s files could not be read, or only in part\n", Count(count).c_str());
  if (folders != 0) (void)fprintf(stderr, "%s folders are left out\n", Count(folders).c_str());
  left_out.Warn();
  return left_out.Empty() ? kDone : kIncomplete;
}

}  // namespace ferrox::cli
