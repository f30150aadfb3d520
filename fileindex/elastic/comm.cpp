#include "fileindex/elastic/comm.h"

#include <syslog.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <string>
#include <utility>

#include <json/value.h>

#include <kova/sock_connection.h>

#include "common/clock.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "fileindex/util.h"

namespace ferrox::fileindex::elastic {

namespace {

/// The engine may be about to start: its socket is looked for 16 times, a second apart.
constexpr int kSocketChecks = 16;
constexpr std::chrono::milliseconds kSocketPause{1000};
/// After this many refusals the administrators are notified: about three hours of an engine without memory or space.
constexpr unsigned int kRetriesBeforeNotice = 11;
constexpr char kUnusableReply[] =
    "!conn.Recv(resp_raw) || !res.fromString(resp_raw) || !res.isMember(\"success\") || !res[\"success\"].isBool()";

bool IsBusy(int code) { return code == Error::kEngineBusy || code == Error::kEngineBusyMemory; }

/// An optional member of what need not be an object.
template <typename T>
T Member(const Json::Value& object, const char* key, T absent = {}) {
  if (object.isObject()) GetJsonValue(absent, object, key, false);
  return absent;
}

/// Returns when there is a file at the socket's path, or after the last check. Only connecting shows whether a process
/// serves it.
void WaitForSocket(const std::string& path) {
  for (int check = 1; check <= kSocketChecks; ++check) {
    if (access(path.c_str(), F_OK) == 0 || check == kSocketChecks) return;
    Log(LOG_ERR, "%s:%d elastic socket is not ready, retry ... %d", ModuleName(FERROX_SOURCE).c_str(), __LINE__, check);
    Clock::Get().SleepFor(kSocketPause);
  }
}

/// Whether a whole reply came that says whether the request succeeded.
bool ReceiveReply(Json::Value& res, kovadaemon::SockConnection& conn) {
  std::string text;
  return conn.Recv(text) && fromString(res, text) && res.isObject() && res.isMember("success") &&
         res["success"].isBool();
}

/// @throws SubjectError with the engine's code and sentence; Error kBadArgument when its reply lacks one of them.
void ThrowIfFailed(const Json::Value& res) {
  if (res["success"].asBool()) return;
  int code = 0;
  std::string message;
  const Json::Value error = Member<Json::Value>(res, "error");
  GetJsonValue(code, error, "code", true);
  GetJsonValue(message, error, "msg", true);
  throw SubjectError(static_cast<Error::ErrorCode>(code), "Request failed, msg=" + message,
                     {Subject::kEngineRefusal, message});
}

/// Whether each part's result is an object, as is its error, if any; null counts as an empty one.
bool AreResults(const Json::Value& results) {
  if (!IsJsonArray(results)) return false;
  for (const Json::Value& result : results) {
    if (!IsJsonObject(result) || !IsJsonObject(Member<Json::Value>(result, "error"))) return false;
  }
  return true;
}

/// Logs the parts of a compound request that failed. @throws Error when one of them failed since the engine is busy.
void CheckParts(const Json::Value& parts, const Json::Value& results) {
  for (Json::ArrayIndex i = 0; i < results.size(); ++i) {
    if (Member(results[i], "success", false)) continue;
    const Json::Value error = Member<Json::Value>(results[i], "error");
    const int code = Member(error, "code", 0);
    const std::string message = Member<std::string>(error, "msg");
    if (IsBusy(code)) throw Error(static_cast<Error::ErrorCode>(code), message);
    const std::string part = toString(parts.isArray() && i < parts.size() ? parts[i] : Json::Value());
    Log(LOG_ERR, "%s:%d (%d, %u) (%s) Compound failed: %s (%d) %s%s", ModuleName(FERROX_SOURCE).c_str(), __LINE__,
        getpid(), geteuid(), "SendRequestImpl", part.c_str(), code, message.c_str(), ErrnoSuffix().c_str());
  }
}

/// Names the command and its index, not the documents, which may be many.
void LogBusy(unsigned int retry, const Json::Value& req) {
  Log(LOG_ERR, "%s:%d Retry[%u] since kovaelasticd is busy. Command: %s, db: %s", ModuleName(FERROX_SOURCE).c_str(),
      __LINE__, retry, Member<std::string>(req, "command").c_str(),
      Member<std::string>(Member<Json::Value>(req, "data"), "id").c_str());
}

/// 15 to 19 minutes, so that those who wait do not come back together.
std::chrono::seconds BusyDelay() { return std::chrono::seconds(900 + 60 * (rand() % 5)); }

/// Whether the engine took the request; false when it is busy.
bool TrySendRequest(Json::Value& res, const Json::Value& req) {
  try {
    SendRequestImpl(res, req);
    return true;
  } catch (const Error& error) {
    if (!IsBusy(error.Code())) throw;
    return false;
  }
}

}  // namespace

void SendRequestImpl(Json::Value& res, const Json::Value& req) {
  const std::string path = InstancePath(kElasticdSocket);
  res = Json::Value();
  WaitForSocket(path);
  kovadaemon::DomainSockConnection conn(path);
  FERROX_FAIL_IF(!conn.Connect(), Error::kEngineUnreachable, "Connect failed", Subject{Subject::kEngineConnect, ""});
  FERROX_FAIL_IF_AS(!conn.Send(toString(req)), "!conn.Send(req.toString())", Error::kEngineUnreachable, "Send failed",
                    Subject{Subject::kEngineSend, ""});
  FERROX_FAIL_IF_AS(!ReceiveReply(res, conn), kUnusableReply, Error::kEngineUnreachable,
                    "Recv failed, res=" + toString(res), Subject{Subject::kEngineReply, ""});
  ThrowIfFailed(res);
  if (!req.isObject() || !req.isMember("compound") || !Member(res, "has_fail", false)) return;
  const Json::Value& results = std::as_const(res)["data"];
  FERROX_FAIL_IF_AS(!AreResults(results), kUnusableReply, Error::kEngineUnreachable,
                    "Recv failed, res=" + toString(res), Subject{Subject::kEngineReply, ""});
  CheckParts(req["compound"], results);
}

void SendRequest(Json::Value& res, const Json::Value& req) {
  bool noticed = false;
  for (unsigned int retry = 0; !TrySendRequest(res, req);) {
    LogBusy(retry++, req);
    if (retry >= kRetriesBeforeNotice && !noticed) {
      NotifyLackOfMemory();
      noticed = true;
    }
    Clock::Get().SleepFor(BusyDelay());
  }
}

void SendRequest(const Json::Value& req) {
  Json::Value dropped;
  SendRequest(dropped, req);
}

}  // namespace ferrox::fileindex::elastic
