#include "platform/host/content/extract_client.h"

#include <chrono>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>

#include <json/reader.h>
#include <json/writer.h>

#include <kova/content_extract.h>
#include <kova/instance.h>
#include <kova/service.h>
#include <kova/sock_connection.h>

#include "platform/host/child_service.h"
#include "platform/host/files.h"
#include "platform/host/share_table.h"

namespace kova::content {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr char kService[] = "kovacontentextractd";
constexpr char kSocket[] = "/var/run/kovacontentextractd.sock";
/// An answer holds at most a megabyte of text, and fields.
constexpr uint32_t kAnswerMaxBytes = 16U << 20;
/// After a start that failed, no other is tried for so long.
constexpr std::chrono::seconds kStartPause{5};

thread_local std::string t_problem;

[[noreturn]] void ThrowProblem(const std::string& problem) {
  t_problem = problem;
  throw std::runtime_error(problem);
}

/// The folder that the file must be reached from without a link: its share's, else its own.
std::string RootOf(const std::string& path) {
  const std::shared_ptr<const host::ShareTable> table = host::ShareTable::Current();
  const host::ShareEntry* entry = table != nullptr ? table->ByFullPath(path) : nullptr;
  return entry != nullptr && entry->path != path ? entry->path : host::FolderOf(path);
}

/// Starts the daemon once for all threads that find it missing. @return "" when it runs, else the reason.
std::string StartDaemon() {
  static std::mutex mutex;
  static SteadyClock::time_point failed_at;
  static std::string failure;
  const std::lock_guard<std::mutex> guard(mutex);
  if (!failure.empty() && SteadyClock::now() - failed_at < kStartPause) return failure;
  failure.clear();
  if (KLIBServiceStart(kService, 1) >= 0) return {};
  const std::string reason = host::LastServiceProblem();
  failed_at = SteadyClock::now();
  return failure = reason.empty() ? "it could not be started" : reason;
}

/// Nothing when the daemon does not run, or ends meanwhile.
std::optional<std::string> AskOnce(const std::string& request) {
  kovadaemon::DomainSockConnection connection(InstanceRoot() + kSocket);
  connection.SetMessageLimit(kAnswerMaxBytes);
  std::string reply;
  if (!connection.Connect() || !connection.Send(request) || !connection.Recv(reply)) return std::nullopt;
  return reply;
}

std::string Ask(const std::string& request) {
  std::optional<std::string> reply = AskOnce(request);
  if (reply) return *std::move(reply);
  const std::string problem = StartDaemon();
  if (!problem.empty()) ThrowProblem("content cannot be read: " + problem);
  reply = AskOnce(request);
  if (!reply) ThrowProblem("content cannot be read: kovacontentextractd ends before it answers; see its log");
  return *std::move(reply);
}

std::string RequestText(const std::string& path) {
  Json::Value request;
  request["type"] = "extract";
  request["data"]["root"] = RootOf(path);
  request["data"]["path"] = path;
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  builder["emitUTF8"] = true;
  return Json::writeString(builder, request);
}

/// A JSON object and, behind a zero byte, the file's text.
bool ReadReply(const std::string& reply, Json::Value& json, std::string& text) try {
  const size_t json_bytes = std::min(reply.find('\0'), reply.size());
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  if (!reader->parse(reply.data(), reply.data() + json_bytes, &json, nullptr) || !json.isObject()) return false;
  if (json_bytes < reply.size()) text = reply.substr(json_bytes + 1);
  return json["success"].isBool() && json["data"].isObject() == json["success"].asBool();
} catch (const std::exception&) {
  return false;
}

}  // namespace

Extraction ExtractContent(const std::string& path) {
  Json::Value json;
  std::string text;
  const std::string reply = Ask(RequestText(path));
  if (!ReadReply(reply, json, text)) ThrowProblem("content cannot be read: kovacontentextractd answers nonsense");
  if (!json["success"].asBool()) ThrowProblem("content cannot be read: " + json["error"]["msg"].asString());
  Extraction extraction;
  const Json::Value& data = json["data"];
  extraction.gone = data["gone"].isBool() && data["gone"].asBool();
  extraction.inode = data["inode"].isUInt64() ? data["inode"].asUInt64() : 0;
  extraction.document = data["document"];
  if (!text.empty()) extraction.document["KOVAMDTextContent"] = std::move(text);
  return extraction;
}

void ClearExtractionProblem() { t_problem.clear(); }

}  // namespace kova::content

std::string KOVA::CONTENT_EXTRACT::ExtractionProblem() { return kova::content::t_problem; }
