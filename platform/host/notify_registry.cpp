#include "platform/host/notify_registry.h"

#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>

#include <json/value.h>
#include <json/writer.h>

#include <kova/instance.h>
#include <kova/notifyd.h>

#include "base/files.h"
#include "platform/host/files.h"
#include "platform/host/log.h"
#include "platform/shared/failure.h"
#include "platform/shared/index_paths.h"
#include "platform/shared/monitor_document.h"

namespace kova::host {

namespace {

constexpr char kSuffix[] = ".json";

/// What one registration is found by.
struct Key {
  std::string queue;
  std::string application;
  int type = 0;

  /// Different keys have different files: no application's name holds a "/".
  std::string File() const {
    return RegistryFolder() + "/" + EscapeSharePath("/" + application + "/" + std::to_string(type) + queue) + kSuffix;
  }
};

Json::Value ToJson(const Json::Value& document, const Key& key) {
  Json::Value object = document;
  object["application"] = key.application;
  object["type"] = key.type;
  return object;
}

std::string ToText(const Json::Value& object) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  builder["emitUTF8"] = true;
  return Json::writeString(builder, object) + "\n";
}

/// What is wrong with a registration's file; empty when nothing is. A missing file is a null value.
std::string ReadFile(const std::string& path, Json::Value& object) {
  std::string problem = ReadJsonFile(path, object);
  if (problem.empty() && object.isNull() && access(path.c_str(), F_OK) != 0) return {};
  if (problem.empty()) problem = MonitorDocumentProblem(object);
  if (problem.empty() && (!object["application"].isString() || !object["type"].isInt())) {
    problem = "\"application\" or \"type\" is missing";
  }
  if (problem.empty()) {
    const Key key = {object["queue"].asString(), object["application"].asString(), object["type"].asInt()};
    if (key.File() != path) problem = "it holds the registration that belongs in " + key.File();
  }
  if (problem.empty()) return {};
  return "the registration " + path + " cannot be used (" + problem +
         "); who registers it again replaces it, which the index daemon does for the shares within 30 s";
}

Registration FromJson(const Json::Value& object) {
  Registration registration = {object["application"].asString(), object["type"].asInt(), object["queue"].asString()};
  for (const Json::Value& element : object["config"]) {
    Watch watch = {element["path"].asString(), element["mask"].asUInt()};
    for (const Json::Value& name : element["ignore"]) watch.ignore.push_back(name.asString());
    registration.watches.push_back(std::move(watch));
  }
  return registration;
}

bool Refuse(int code, const std::string& problem) {
  LogLine(LOG_ERR, problem);
  (void)KOVA_FAIL(code);
  return false;
}

bool RefuseBySystem(const std::string& problem, int error) {
  errno = error;
  return Refuse(SystemFailureCode(), problem + ": " + strerror(error));
}

std::string KeyProblem(const Key& key) {
  if (key.application.empty() || key.application.find_first_of(std::string("/\0", 2)) != std::string::npos) {
    return "\"" + key.application + "\" cannot be the name of an application that registers a queue";
  }
  return {};
}

/// Where a damaged file is kept, one for each registration; its name is none of a registration.
std::string KeptAt(const std::string& path) { return path + ".damaged"; }

/// Changes the file of one registration while nobody else does. One whose content cannot be used is set aside: by its
/// name it is this very registration, so nobody else's watches are dropped. One that cannot be read stays as it is.
template <typename Change>
bool ChangeFile(const Key& key, Change change) {
  const std::string path = key.File();
  const ExclusiveLock lock(RegistryFolder() + ".lock");
  if (lock.Problem() != 0) {
    errno = lock.Problem();
    return Refuse(SystemFailureCode(), lock.ProblemText());
  }
  Json::Value present;
  const std::string problem = ReadFile(path, present);
  std::string text;
  if (!problem.empty() && !ReadTextFile(path, text).empty()) return Refuse(KOVA_ERR_BAD_CONFIGURATION, problem);
  if (!problem.empty()) {
    present = Json::Value();
    LogLine(LOG_WARNING, problem + "; it is set aside as " + KeptAt(path));
    if (chmod(path.c_str(), 0600) != 0 || rename(path.c_str(), KeptAt(path).c_str()) != 0) {
      return RefuseBySystem("cannot set the registration " + path + " aside", errno);
    }
  }
  return change(path, !present.isNull()) || RefuseBySystem("cannot change the registration " + path, errno);
}

}  // namespace

std::string RegistryFolder() { return InstanceRoot() + "/var/lib/kova/notifyd/queues"; }

Registrations ReadRegistrations() {
  std::vector<std::string> paths;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(RegistryFolder(), error), end; !error && entry != end;
       entry.increment(error)) {
    if (entry->path().extension() == kSuffix) paths.push_back(entry->path());
  }
  std::sort(paths.begin(), paths.end());
  Registrations registrations;
  if (error && error != std::errc::no_such_file_or_directory) {
    registrations.problems.push_back("the folder " + RegistryFolder() + " cannot be read: " + error.message());
  }
  for (const std::string& path : paths) {
    Json::Value object;
    const std::string problem = ReadFile(path, object);
    if (!problem.empty()) {
      registrations.problems.push_back(problem);
    } else if (!object.isNull()) {
      registrations.list.push_back(FromJson(object));
    }
  }
  return registrations;
}

}  // namespace kova::host

namespace KOVA::KOVANOTIFYD {

using namespace kova::host;

bool MonitorQueue::Upsert(const MonitorQueue& queue, const std::string& application, int type) {
  std::vector<std::string> left_out;
  const Json::Value document = kova::WithoutTrailingSlashes(queue.Document(), left_out);
  std::string problem = kova::MonitorDocumentProblem(document);
  if (!problem.empty()) return Refuse(KOVA_ERR_BAD_PARAMETER, "nothing is registered: " + problem);
  const Key key = {document["queue"].asString(), application, type};
  for (const std::string& path : left_out) {
    LogChange(LOG_ERR, "left out " + key.queue + " " + path,
              "the folder " + path + " is not watched for " + key.queue +
                  ": its path ends in \"/\"; correct it in the list of folders");
  }
  const std::string text = ToText(ToJson(document, key));
  problem = KeyProblem(key);
  if (problem.empty() && text.size() > kFileMaxBytes) problem = "the registration of " + key.queue + " is too large";
  if (!problem.empty()) return Refuse(KOVA_ERR_BAD_PARAMETER, problem);
  std::string present;
  if (ReadTextFile(key.File(), present).empty() && present == text) return true;
  return ChangeFile(key, [&](const std::string& path, bool) {
    return base::MakeFoldersDurably(RegistryFolder(), 0755) && ReplaceFile(path, text, 0644);
  });
}

bool MonitorQueue::Delete(const std::string& queue_path, const std::string& application, int type) {
  const Key key = {queue_path, application, type};
  if (!KeyProblem(key).empty()) return true;  // nobody can have registered it
  return ChangeFile(key, [](const std::string& path, bool is_there) {
    (void)unlink(KeptAt(path).c_str());
    return !is_there || RemoveFile(path);
  });
}

}  // namespace KOVA::KOVANOTIFYD
