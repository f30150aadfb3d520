#include "cli/left_out.h"

#include <algorithm>
#include <cstdio>

#include "cli/ask.h"
#include "cli/command.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "cli/output.h"
#include "common/error.h"
#include "common/file_util.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "wire/engine_requests.h"

namespace ferrox::cli {

namespace {

using fileindex::elastic::GetFileIndexID;

/// The share of an index; the id itself where it is none of a share.
std::string ShareOf(const std::string& index_id) {
  const std::string prefix = GetFileIndexID("");
  return StringStartWith(index_id, prefix) ? index_id.substr(prefix.size()) : index_id;
}

/// Whether the share is indexed at all, for the choice of the remedy.
bool HasFolders(const std::string& share) try {
  return fileindex::FolderMgr().IsShareIndexed(share);
} catch (const Error&) {
  return true;  // not known; commands that need the list of folders say why
}

/// In the words of the tool, where the engine refused with `code` and `reason`.
std::string WhyUnusable(const std::string& share, int code, const std::string& reason) {
  if (code == Error::kEngineIndexPaused) return "it is paused; 'fileindexctl share resume " + share + "' resumes it";
  if (code != Error::kEngineNoSuchIndex) return reason;
  if (!HasFolders(share)) return "no folder of it is indexed; 'fileindexctl folder add /" + share + "' adds all of it";
  return "it has no index yet; the index daemon will make it; 'fileindexctl status' shows what it is doing";
}

}  // namespace

void LeftOut::Add(const std::string& share, int code, const std::string& reason, bool searched) {
  Json::Value entry;
  entry["share"] = share;
  entry["id"] = share.empty() ? "" : GetFileIndexID(share);
  entry["code"] = code;
  entry["reason"] = reason;
  entry["searched"] = searched;
  Put(std::move(entry));
}

void LeftOut::AddForUser(const std::string& share, int code, const std::string& reason, bool searched) {
  Json::Value entry;
  entry["share"] = share;
  entry["code"] = code;
  entry["reason"] = reason;
  entry["searched"] = searched;
  Put(std::move(entry));
}

void LeftOut::Put(Json::Value entry) {
  const std::string share = TextOf(entry, "share");
  // The later reason is the one that counts: what was searched nevertheless may fail after all.
  for (Json::Value& earlier : list_) {
    if (earlier["share"] == share) return earlier.swap(entry);
  }
  list_.append(std::move(entry));
}

/// The engine names indices and gives its own reasons; people know shares, and what they can do.
void LeftOut::AddFrom(const Json::Value& reply) {
  if (!reply.isArray()) return;
  for (const Json::Value& entry : reply) {
    const std::string share = ShareOf(TextOf(entry, "id"));
    const auto code = static_cast<int>(IntOf(entry, "code"));
    Add(share, code, WhyUnusable(share, code, TextOf(entry, "reason")), entry["searched"] == true);
  }
}

bool LeftOut::AddIfRebuilding(const std::string& share) {
  const Json::Value rebuilding = AskEngine(wire::IndexRequest("index_stat", GetFileIndexID(share)))["rebuilding"];
  if (!rebuilding.isObject()) return false;
  Add(share, 0, "its index is being rebuilt, because " + TextOf(rebuilding, "reason"), true);
  return true;
}

size_t LeftOut::Unsearched() const {
  return static_cast<size_t>(
      std::count_if(list_.begin(), list_.end(), [](const Json::Value& entry) { return entry["searched"] == false; }));
}

/// Errors below the engine's codes are no refusals: the engine cannot be reached, or the configuration cannot be read,
/// which concerns all shares.
bool LeftOut::Unless(const std::string& share, const std::function<void()>& run) {
  const auto leave_out = [&](int code, const std::string& reason) {
    Add(share, code, WhyUnusable(share, code, reason));
    return false;
  };
  try {
    run();
    return true;
  } catch (const Refusal& refusal) {
    return leave_out(refusal.Code(), refusal.Reason());
  } catch (const Error& error) {
    if (error.Code() < Error::kEngineBusy || error.Code() >= Error::kTreeInconsistent) throw;
    return leave_out(error.Code(), error.what());
  }
}

void LeftOut::Warn() const {
  for (const Json::Value& entry : list_) {
    const std::string share = TextOf(entry, "share");
    const std::string what = entry["searched"].asBool() ? "only what has been indexed so far: " : "left out: ";
    cli::Warn(what + (share.empty() ? "" : "share " + share + ": ") + EscapeOneLine(TextOf(entry, "reason")));
  }
}

}  // namespace ferrox::cli
